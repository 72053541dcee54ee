// The live entries of a dictionary in ascending order of their keys.
#pragma once

#include <cstddef>
#include <cstdint>

#include "platform/property/node.h"

namespace quorvel::detail {

class SortedEntries {
 public:
  /// Tests false when memory runs out. The dictionary, which keeps the order it was found to have, may not change or
  /// end meanwhile. Any thread.
  explicit SortedEntries(const DictionaryNode& dictionary) noexcept;

  [[nodiscard]] explicit operator bool() const noexcept { return valid_; }
  [[nodiscard]] const Entry& operator[](std::size_t index) const noexcept {
    return order_ == nullptr ? entries_[index] : entries_[order_[index]];
  }

 private:
  const Entry* entries_;
  const std::uint32_t* order_ = nullptr;  // null where the entries stand in order and without gaps
  bool valid_;
};

}  // namespace quorvel::detail
