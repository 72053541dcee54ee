#include "platform/property/sorted_entries.h"

#include <algorithm>
#include <cstdlib>
#include <memory>

#include "platform/property/binary_format.h"

namespace quorvel::detail {

namespace {

// An entry with the first eight bytes behind what all keys share, as a number that compares as the bytes do.
struct SortItem {
  std::uint64_t prefix;
  std::uint32_t entry;
};

std::size_t shared_length(std::string_view left, std::string_view right) noexcept {
  const std::size_t limit = std::min(left.size(), right.size());
  return static_cast<std::size_t>(
      std::mismatch(left.begin(), left.begin() + static_cast<std::ptrdiff_t>(limit), right.begin()).first -
      left.begin());
}

std::uint64_t prefix_of(std::string_view key, std::size_t shared) noexcept {
  std::byte bytes[8] = {};
  const std::size_t count = std::min<std::size_t>(8, key.size() - shared);
  if (count > 0) std::memcpy(bytes, key.data() + shared, count);
  return binary_format::get_integer(bytes, 8);
}

std::uint32_t list_live(const DictionaryNode& dictionary, std::uint32_t* order) noexcept {
  std::uint32_t live = 0;
  for (std::uint32_t i = 0; i < dictionary.used; ++i) {
    if (dictionary.entries()[i].key != 0) order[live++] = i;
  }
  return live;
}

bool sort(const Entry* entries, std::uint32_t* order, std::uint32_t count) noexcept {
  const auto key = [&](std::uint32_t entry) { return text_of(entries[entry].key); };
  std::size_t shared = count > 0 ? key(order[0]).size() : 0;
  for (std::uint32_t i = 1; i < count; ++i) {
    shared = shared_length(key(order[0]).substr(0, shared), key(order[i]));
  }
  const std::unique_ptr<SortItem, decltype(&std::free)> items(
      static_cast<SortItem*>(std::malloc((count + 1) * sizeof(SortItem))), &std::free);
  if (items == nullptr) return false;
  for (std::uint32_t i = 0; i < count; ++i) items.get()[i] = {prefix_of(key(order[i]), shared), order[i]};
  std::sort(items.get(), items.get() + count, [&](const SortItem& left, const SortItem& right) {
    return left.prefix != right.prefix ? left.prefix < right.prefix : key(left.entry) < key(right.entry);
  });
  for (std::uint32_t i = 0; i < count; ++i) order[i] = items.get()[i].entry;
  return true;
}

}  // namespace

SortedEntries::SortedEntries(const DictionaryNode& dictionary) noexcept : entries_(dictionary.entries()) {
  const bool is_sorted = (dictionary.flags & kSorted) != 0;
  if (is_sorted && dictionary.live == dictionary.used) {
    valid_ = true;
    return;
  }
  order_ = static_cast<std::uint32_t*>(std::malloc((std::size_t{dictionary.live} + 1) * sizeof(std::uint32_t)));
  if (order_ == nullptr) return;
  const std::uint32_t live = list_live(dictionary, order_);
  valid_ = is_sorted || sort(entries_, order_, live);
}

SortedEntries::~SortedEntries() { std::free(order_); }

}  // namespace quorvel::detail
