#include "property/binary/sorted_entries.h"

#include <algorithm>
#include <cstdlib>
#include <memory>

#include "property/binary/format.h"

namespace quorvel::detail {

namespace {

struct Free {
  void operator()(void* memory) const noexcept { std::free(memory); }
};
template <class T>
using Row = std::unique_ptr<T, Free>;

template <class T>
Row<T> make_row(std::size_t count) noexcept {
  return Row<T>(static_cast<T*>(std::malloc((count + 1) * sizeof(T))));
}

// An entry with the first eight bytes behind what all keys share, as a number that compares as the bytes do.
struct SortItem {
  std::uint64_t prefix;
  std::uint32_t entry;
};

std::size_t shared_length(std::string_view left, std::string_view right) noexcept {
  const auto limit = static_cast<std::ptrdiff_t>(std::min(left.size(), right.size()));
  return static_cast<std::size_t>(std::mismatch(left.begin(), left.begin() + limit, right.begin()).first -
                                  left.begin());
}

std::uint64_t prefix_of(std::string_view key, std::size_t shared) noexcept {
  std::byte bytes[8] = {};
  const std::size_t count = std::min<std::size_t>(8, key.size() - shared);
  if (count > 0) std::memcpy(bytes, key.data() + shared, count);
  return binary_format::get_integer(bytes, 8);
}

class Sorter {
 public:
  explicit Sorter(const DictionaryNode& dictionary) noexcept : dictionary_(dictionary) {}

  // The order of all live entries, or null when memory runs out.
  Row<std::uint32_t> sort() noexcept {
    Row<std::uint32_t> order = make_row<std::uint32_t>(dictionary_.live);
    if (order == nullptr) return nullptr;
    std::uint32_t* const tail = list_live(order.get());
    std::uint32_t* const end = order.get() + dictionary_.live;
    if (tail == end) return order;
    if (!sort_tail(tail, end)) return nullptr;
    if (tail == order.get()) return order;
    Row<std::uint32_t> merged = make_row<std::uint32_t>(dictionary_.live);
    if (merged == nullptr) return nullptr;
    std::merge(order.get(), tail, tail, end, merged.get(),
               [this](std::uint32_t left, std::uint32_t right) { return key(left) < key(right); });
    return merged;
  }

 private:
  [[nodiscard]] std::string_view key(std::uint32_t entry) const noexcept {
    return text_of(dictionary_.entries()[entry].key);
  }

  // Lists the live entries as they stand; returns where those begin that are not known to ascend.
  std::uint32_t* list_live(std::uint32_t* order) const noexcept {
    std::uint32_t* tail = order;
    for (std::uint32_t i = 0; i < dictionary_.used; ++i) {
      if (dictionary_.entries()[i].key == 0) continue;
      *order++ = i;
      if (i < dictionary_.ascending) tail = order;
    }
    return tail;
  }

  bool sort_tail(std::uint32_t* first, const std::uint32_t* last) noexcept {
    const auto count = static_cast<std::size_t>(last - first);
    std::size_t shared = key(*first).size();
    for (const std::uint32_t* at = first; at != last; ++at) {
      shared = shared_length(key(*first).substr(0, shared), key(*at));
    }
    const Row<SortItem> items = make_row<SortItem>(count);
    if (items == nullptr) return false;
    SortItem* const begin = items.get();
    for (std::size_t i = 0; i < count; ++i) begin[i] = {prefix_of(key(first[i]), shared), first[i]};
    std::sort(begin, begin + count, [this](const SortItem& left, const SortItem& right) {
      return left.prefix != right.prefix ? left.prefix < right.prefix : key(left.entry) < key(right.entry);
    });
    for (std::size_t i = 0; i < count; ++i) first[i] = begin[i].entry;
    return true;
  }

  const DictionaryNode& dictionary_;
};

}  // namespace

SortedEntries::SortedEntries(const DictionaryNode& dictionary, const OmittedEntries* omitted) noexcept
    : entries_(dictionary.entries()), size_(dictionary.live) {
  if (dictionary.ascending < dictionary.used || dictionary.live < dictionary.used) find_order(dictionary);
  if (valid_ && omitted != nullptr && omitted->count() > 0) leave_out(*omitted);
}

void SortedEntries::find_order(const DictionaryNode& dictionary) noexcept {
  std::uint32_t* order = dictionary.order.load(std::memory_order_acquire);
  if (order == nullptr) {
    Row<std::uint32_t> sorted = Sorter(dictionary).sort();
    valid_ = sorted != nullptr;
    if (valid_ && dictionary.order.compare_exchange_strong(order, sorted.get(), std::memory_order_acq_rel)) {
      order = sorted.release();
    }
  }
  order_ = order;
}

void SortedEntries::leave_out(const OmittedEntries& omitted) noexcept {
  own_ = make_row<std::uint32_t>(size_).release();
  valid_ = own_ != nullptr;
  if (!valid_) return;
  std::uint32_t* end = own_;
  for (std::uint32_t i = 0; i < size_; ++i) {
    *end = order_ == nullptr ? i : order_[i];
    end += omitted.contains(*end) ? 0 : 1;
  }
  size_ = static_cast<std::size_t>(end - own_);
  order_ = own_;
}

}  // namespace quorvel::detail
