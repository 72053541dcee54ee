// The bits of a word, which is what a value is held in:
//
//   0       no value
//   ...001  integer: the upper 61 bits, signed. Every integer that fits is held this way, so that words compare.
//   ...011  boolean: bit 3
//   ...000  the address of a node, which is eight-byte aligned
//
// While a file is read, the lowest bits mean more than that: see binary/made_word.h.
#pragma once

#include <cstdint>

namespace quorvel::detail {

using Word = std::uintptr_t;

inline constexpr Word kImmediateBit = 1;  // no node
inline constexpr Word kTagMask = 7;
inline constexpr unsigned kTagBits = 3;
inline constexpr Word kIntegerTag = 1;
inline constexpr Word kBooleanTag = 3;
inline constexpr Word kFalse = kBooleanTag;
inline constexpr Word kTrue = kBooleanTag | Word{1} << kTagBits;
inline constexpr std::int64_t kImmediateMaximum = (std::int64_t{1} << 60) - 1;
inline constexpr std::int64_t kImmediateMinimum = -(std::int64_t{1} << 60);
static_assert(sizeof(Word) == 8);
static_assert((kImmediateMaximum << kTagBits) >> kTagBits == kImmediateMaximum);

[[nodiscard]] inline bool is_node(Word word) noexcept { return word != 0 && (word & kImmediateBit) == 0; }
[[nodiscard]] inline Word immediate_integer(std::int64_t value) noexcept {
  return (static_cast<Word>(value) << kTagBits) | kIntegerTag;
}
[[nodiscard]] inline std::int64_t immediate_value(Word word) noexcept {
  return static_cast<std::int64_t>(word) >> kTagBits;
}

/// Choosing without a branch, because compilers make branches of conditions: a mask has all bits set, or none.
[[nodiscard]] constexpr Word mask_of(Word bit) noexcept { return 0 - (bit & 1); }
[[nodiscard]] constexpr Word select(Word mask, Word yes, Word no) noexcept { return no ^ ((no ^ yes) & mask); }
static_assert(select(mask_of(1), 6, 5) == 6 && select(mask_of(2), 6, 5) == 5);

}  // namespace quorvel::detail
