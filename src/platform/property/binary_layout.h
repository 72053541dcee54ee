// The bones of a binary property list: its trailer, its offset table and where each object begins and ends. Everything
// that reads one looks at its bytes through this, with every number checked before it is used.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>

#include "platform/property/binary_format.h"

namespace quorvel::detail {

/// One object, taken apart but not looked into.
struct EncodedObject {
  std::uint8_t kind;    // the marker's high four bits
  std::uint8_t nibble;  // its low four
  std::uint64_t size;   // bytes of a number, elements of a text, data or container
  const std::byte* body;
  const std::byte* end;
  [[nodiscard]] bool is_container() const noexcept {
    return kind == binary_format::kArray || kind == binary_format::kDictionary;
  }
};

class BinaryLayout {
 public:
  /// Takes in the trailer of `bytes`, which must outlive the layout. False when it cannot be one.
  [[nodiscard]] bool parse(std::span<const std::byte> bytes) noexcept;

  [[nodiscard]] std::uint64_t count() const noexcept { return count_; }
  [[nodiscard]] std::uint64_t top() const noexcept { return top_; }
  [[nodiscard]] std::size_t reference_size() const noexcept { return reference_size_; }

  /// Where object `index`, which is below the count, is said to begin.
  [[nodiscard]] std::uint64_t offset_of(std::uint64_t index) const noexcept {
    return binary_format::get_integer(table_ + index * offset_size_, offset_size_);
  }
  /// Where an object ends, counted as its offset is.
  [[nodiscard]] std::uint64_t end_of(const EncodedObject& object) const noexcept {
    return static_cast<std::uint64_t>(object.end - start_);
  }
  /// The reference at `at`, which may be out of range.
  [[nodiscard]] std::uint64_t reference_at(const std::byte* at) const noexcept {
    return binary_format::get_integer(at, reference_size_);
  }
  /// The marker at an offset, or null when no object can begin there.
  [[nodiscard]] const std::byte* marker_at(std::uint64_t offset) const noexcept {
    const bool is_inside =
        offset >= binary_format::kHeader.size() && offset < static_cast<std::uint64_t>(table_ - start_);
    return is_inside ? start_ + offset : nullptr;
  }
  /// Takes an object apart. False when none can begin at `offset`, or it does not end before the table.
  [[nodiscard]] bool object_at(std::uint64_t offset, EncodedObject& object) const noexcept;

 private:
  [[nodiscard]] bool parse_size(EncodedObject& object) const noexcept;

  const std::byte* start_ = nullptr;
  const std::byte* table_ = nullptr;  // where the objects end as well
  std::size_t offset_size_ = 0;
  std::size_t reference_size_ = 0;
  std::uint64_t count_ = 0;
  std::uint64_t top_ = 0;
};

/// True when a number of 16 bytes is one of 64.
[[nodiscard]] bool fits_64_bits(const EncodedObject& wide_integer) noexcept;

}  // namespace quorvel::detail
