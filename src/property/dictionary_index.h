// The index of a dictionary with more than a handful of entries: a table with linear probing, at most three quarters
// full, of which every slot leads to an entry.
#pragma once

#include <bit>
#include <cstdint>
#include <string_view>

#include "property/node.h"

namespace quorvel::detail {

/// Up to this many entries are found by scanning, without an index.
inline constexpr std::uint32_t kUnindexed = 8;

/// How many slots the index of `entries` entries has.
[[nodiscard]] inline std::uint32_t index_size_for(std::uint32_t entries) noexcept {
  return std::bit_ceil(entries + entries / 3 + 1);
}

/// Puts an entry that is not there yet into an index with room for it.
inline void place(IndexSlot* index, std::uint32_t mask, IndexSlot slot) noexcept {
  std::uint32_t at = slot.hash & mask;
  // Whether a slot is taken cannot be foreseen: the first steps are made without a branch.
  for (int step = 0; step < 2; ++step) at = (at + (index[at].entry != 0 ? 1 : 0)) & mask;
  while (index[at].entry != 0) at = (at + 1) & mask;
  index[at] = slot;
}

/// Makes the index of an empty dictionary that is about to get `entries` entries. False when memory runs out.
[[nodiscard]] bool make_index(DictionaryNode& dictionary, std::uint32_t entries) noexcept;

/// Puts the entries of a dictionary that is being filled into the index that `make_index` made, in their order. The
/// slots of a large index are far away: each is fetched while others are filled.
class IndexFiller {
 public:
  explicit IndexFiller(DictionaryNode& dictionary) noexcept
      : dictionary_(dictionary), index_(dictionary.index), mask_(dictionary.index_size - 1) {}
  IndexFiller(const IndexFiller&) = delete;
  IndexFiller& operator=(const IndexFiller&) = delete;
  ~IndexFiller() { place_all(); }

  /// Adds the entry behind those that are in use, whose key is `text`. With `check`, false when an
  /// entry in use has the same key.
  [[nodiscard]] bool add(std::string_view text, bool check) noexcept {
    // Without an index, only a search needs the hash.
    if (index_ == nullptr) return !check || find_entry(dictionary_, text) == nullptr;
    const HashedKey key(text);
    if (check) {
      place_all();
      if (find_entry(dictionary_, key) != nullptr) return false;
    }
    if (waiting_ == kUnderWay) place_all();
    hashes_[waiting_++] = key.hash;
    __builtin_prefetch(&index_[key.hash & mask_]);
    return true;
  }

 private:
  static constexpr std::uint32_t kUnderWay = 32;

  void place_all() noexcept {
    IndexSlot* const index = index_;
    const std::uint32_t mask = mask_;
    for (std::uint32_t i = 0; i < waiting_; ++i) place(index, mask, {hashes_[i], ++placed_});
    waiting_ = 0;
  }

  DictionaryNode& dictionary_;
  IndexSlot* index_;
  std::uint32_t mask_;
  std::uint32_t placed_ = 0;
  std::uint32_t waiting_ = 0;
  std::uint32_t hashes_[kUnderWay];
};

}  // namespace quorvel::detail
