// Which leaves a writer has numbered already, so that each distinct leaf is written once.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>

#include "property/node.h"

namespace quorvel::detail {

class LeafTable {
 public:
  enum class Outcome { added, found, no_memory };

  LeafTable() noexcept = default;
  LeafTable(const LeafTable&) = delete;
  LeafTable& operator=(const LeafTable&) = delete;
  ~LeafTable() { std::free(slots_); }

  /// Looks up a leaf equal to `leaf` and sets `number` to its number; when there is none, takes `leaf` in under
  /// `number`. The table refers to the leaves that it took in.
  [[nodiscard]] Outcome find_or_add(Word leaf, std::uint32_t& number) noexcept {
    // Values of one file share their leaves, and programs share names: the same word is the same leaf.
    Recent& recent = recent_[(leaf >> 3) % kRecent];
    if (recent.leaf == leaf) {
      number = recent.number;
      return Outcome::found;
    }
    const Outcome outcome = search(leaf, number);
    recent = {leaf, number};
    return outcome;
  }

 private:
  static constexpr std::size_t kRecent = 64;
  struct Recent {
    Word leaf;
    std::uint32_t number;
  };
  struct Slot {
    Word leaf;  // 0 in a free slot
    std::uint32_t hash;
    std::uint32_t number;
  };

  [[nodiscard]] Outcome search(Word leaf, std::uint32_t& number) noexcept;
  [[nodiscard]] bool resize(std::size_t size) noexcept;

  Slot* slots_ = nullptr;
  std::size_t size_ = 0;
  std::size_t used_ = 0;
  Recent recent_[kRecent] = {};
};

}  // namespace quorvel::detail
