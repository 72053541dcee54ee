// The bytes of a dictionary that somebody only passes on: checked as strictly as if they were read, but not taken
// apart.
#pragma once

#include <cstddef>
#include <span>

#include "property/byte_buffer.h"

namespace quorvel {

/// A binary property list with a dictionary on top that `read_binary` would read. The bytes need not be those that
/// `write_binary` gives.
class CheckedBytes {
 public:
  CheckedBytes() noexcept = default;

  /// Takes over `bytes` that pass the check. Otherwise, and when memory runs out, the result tests false and `bytes`
  /// stay as they are; they may still be a property list. The check knows the layouts that writers commonly choose: no
  /// container stands before its parent or has two, and the keys are ASCII, in ascending order. Any thread.
  [[nodiscard]] static CheckedBytes check(ByteBuffer& bytes) noexcept;

  [[nodiscard]] explicit operator bool() const noexcept { return !bytes_.empty(); }
  [[nodiscard]] std::span<const std::byte> bytes() const noexcept { return bytes_.bytes(); }

 private:
  ByteBuffer bytes_;
};

}  // namespace quorvel
