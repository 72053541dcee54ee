// The elements of a container in the order that a writer refers to them in, fetched ahead of their use.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>

#include "property/binary/sorted_entries.h"
#include "property/node.h"

namespace quorvel::detail {

// Entries in ascending order of their keys lie scattered in memory: each is fetched while this many before it are put.
inline constexpr std::size_t kFetchAhead = 16;

inline void fetch(Word word) noexcept {
  if (is_node(word)) __builtin_prefetch(node_of(word));
}

inline void fetch_elements(const ContainerNode& container) noexcept {
  const auto* words = static_cast<const Word*>(container.storage);
  const std::size_t count = container.kind == PropertyKind::dictionary ? container.used * 2 : container.used;
  for (std::size_t i = 0; i < std::min(count, kFetchAhead); ++i) fetch(words[i]);
}

// Entries that were removed do not count: equal values give equal bytes.
[[nodiscard]] inline std::size_t element_count(const ContainerNode& container) noexcept {
  return container.kind == PropertyKind::dictionary ? static_cast<const DictionaryNode&>(container).live
                                                    : container.used;
}

// The keys, or the values, of a dictionary in their order.
template <Word Entry::*part>
class EntryRow {
 public:
  static constexpr bool kHasOnlyTexts = part == &Entry::key;
  explicit EntryRow(const SortedEntries& sorted) noexcept
      : entries_(sorted.entries()), order_(sorted.order()), size_(sorted.size()) {}
  [[nodiscard]] std::size_t size() const noexcept { return size_; }
  [[nodiscard]] Word operator[](std::size_t index) const noexcept {
    const std::size_t ahead = index + kFetchAhead < size_ ? index + kFetchAhead : index;
    if (order_ == nullptr) {
      __builtin_prefetch(node_of(entries_[ahead].*part));
      return entries_[index].*part;
    }
    __builtin_prefetch(node_of(entries_[order_[ahead]].*part));
    return entries_[order_[index]].*part;
  }

 private:
  const Entry* entries_;
  const std::uint32_t* order_;
  std::size_t size_;
};

// The elements of an array.
class ElementRow {
 public:
  static constexpr bool kHasOnlyTexts = false;
  explicit ElementRow(const ArrayNode& array) noexcept : array_(array) {}
  [[nodiscard]] std::size_t size() const noexcept { return array_.used; }
  [[nodiscard]] Word operator[](std::size_t index) const noexcept { return array_.items()[index]; }

 private:
  const ArrayNode& array_;
};

}  // namespace quorvel::detail
