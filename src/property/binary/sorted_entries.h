// The live entries of a dictionary in ascending order of their keys.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>

#include "property/binary/omitted_entries.h"
#include "property/node.h"

namespace quorvel::detail {

class SortedEntries {
 public:
  /// Tests false when memory runs out. The dictionary, which keeps the order it was found to have, may not change or
  /// end meanwhile. The entries in `omitted`, where it is given, are left out. Any thread.
  explicit SortedEntries(const DictionaryNode& dictionary, const OmittedEntries* omitted = nullptr) noexcept;
  SortedEntries(const SortedEntries&) = delete;
  SortedEntries& operator=(const SortedEntries&) = delete;
  ~SortedEntries() { std::free(own_); }

  [[nodiscard]] explicit operator bool() const noexcept { return valid_; }
  [[nodiscard]] std::size_t size() const noexcept { return size_; }
  /// The row that the entries lie in.
  [[nodiscard]] const Entry* entries() const noexcept { return entries_; }
  /// The places of the entries in the row, in order; null where the row itself is in order and without gaps.
  [[nodiscard]] const std::uint32_t* order() const noexcept { return order_; }

 private:
  void find_order(const DictionaryNode& dictionary) noexcept;
  void leave_out(const OmittedEntries& omitted) noexcept;

  const Entry* entries_;
  const std::uint32_t* order_ = nullptr;
  std::uint32_t* own_ = nullptr;  // the order where it is not the dictionary's
  std::size_t size_;
  bool valid_ = true;
};

}  // namespace quorvel::detail
