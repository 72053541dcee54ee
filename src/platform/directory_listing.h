#pragma once

#include <cstddef>

#include "property/byte_buffer.h"

namespace quorvel::platform {

/// The names in a directory of the device, sorted, without "." and "..": at most 4,096 entries of a longer one. Empty
/// when the directory cannot be read or memory runs out. Any thread may make one.
class DirectoryListing {
 public:
  explicit DirectoryListing(const char* path) noexcept;
  [[nodiscard]] bool empty() const noexcept { return order_.empty(); }
  [[nodiscard]] const char* const* begin() const noexcept {
    return reinterpret_cast<const char* const*>(order_.data());
  }
  [[nodiscard]] const char* const* end() const noexcept { return begin() + order_.size() / sizeof(const char*); }

 private:
  ByteBuffer names_;  // each ends in NUL
  ByteBuffer order_;  // pointers into names_
};

}  // namespace quorvel::platform
