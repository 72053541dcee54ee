// Which leaves a writer has numbered, and whether looking another one up pays.
#pragma once

#include <algorithm>
#include <cstdint>

#include "property/binary/leaf_table.h"

namespace quorvel::detail {

/// Looking every leaf up, to store equal ones once, costs more than all the rest of the writing, so it is done where
/// leaves repeat: each look-up spends one from a credit, and each leaf that was there before earns some. Keys and
/// values have a credit each.
class Credit {
 public:
  static constexpr std::uint32_t kFull = 256;

  [[nodiscard]] bool pays() const noexcept { return left_ > 0; }
  void spend() noexcept { --left_; }
  void earn() noexcept { left_ = std::min(left_ + kEarned, kMaximum); }
  /// A container with more than `kFull` elements starts with a full credit, so that every leaf of a small file is
  /// looked up.
  void refill() noexcept { left_ = std::max(left_, kFull); }
  void cancel() noexcept { left_ = 0; }

 private:
  static constexpr std::uint32_t kEarned = 4;
  static constexpr std::uint32_t kMaximum = 4096;
  std::uint32_t left_ = kFull;
};

class LeafNumbers {
 public:
  /// Looks `leaf` up, or takes it in under `next`. False when memory runs out; `number` is its number otherwise.
  [[nodiscard]] bool find_or_add(Word leaf, std::uint32_t next, Credit& credit, std::uint32_t& number) noexcept {
    number = next;
    const LeafTable::Outcome outcome = leaves_.find_or_add(leaf, number);
    credit.spend();
    if (outcome == LeafTable::Outcome::found) credit.earn();
    return outcome != LeafTable::Outcome::no_memory;
  }

  /// The number of false or true; 0, which is the top object's, when it has none yet.
  [[nodiscard]] std::uint32_t& boolean(bool value) noexcept { return booleans_[value ? 1 : 0]; }

 private:
  LeafTable leaves_;
  std::uint32_t booleans_[2] = {};
};

}  // namespace quorvel::detail
