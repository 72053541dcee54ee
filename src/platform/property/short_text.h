// Work on the bytes of short texts. Lengths vary from text to text, so that a branch on one is mispredicted: what is
// common is done without any, eight bytes at a time, overlapping.
#pragma once

#include <algorithm>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

#include "platform/property/binary_format.h"

namespace quorvel::detail {

/// Up to this length a text is short.
inline constexpr std::size_t kShortText = 40;

/// Calls `visit(offset)` for offsets whose words of eight bytes cover a short text, some of them more than once; of
/// fewer than eight bytes, the first word reaches beyond the end.
template <class Visit>
inline void visit_words(std::size_t length, Visit&& visit) noexcept {
  const std::size_t last = length < 8 ? 0 : length - 8;
  visit(0);
  visit(std::min<std::size_t>(last, 8));
  visit(std::min<std::size_t>(last, 16));
  visit(std::min<std::size_t>(last, 24));
  visit(last);
}

/// Where a byte of a short text is above 0x7f, `all` being all its words together. Of fewer than eight bytes only those
/// that are the text's count.
[[nodiscard]] inline bool has_high_bits(std::uint64_t all, std::size_t length) noexcept {
  static constexpr unsigned char kHighBits[16] = {0x80, 0x80, 0x80, 0x80, 0x80, 0x80, 0x80, 0x80};
  std::uint64_t mask;
  std::memcpy(&mask, kHighBits + 8 - std::min<std::size_t>(length, 8), sizeof mask);
  return (all & mask) != 0;
}

/// Whether `left` stands before `right` in ascending order. Neighbouring keys share much of their beginning.
[[nodiscard]] inline bool stands_before(std::string_view left, std::string_view right) noexcept {
  const std::size_t shared = std::min(left.size(), right.size());
  if (shared < 8) return left < right;
  const auto word = [](std::string_view text, std::size_t at) {
    return binary_format::get_integer(reinterpret_cast<const std::byte*>(text.data()) + at, 8);
  };
  for (std::size_t at = 0; at + 8 < shared; at += 8) {
    const std::uint64_t a = word(left, at), b = word(right, at);
    if (a != b) return a < b;
  }
  const std::uint64_t a = word(left, shared - 8), b = word(right, shared - 8);
  return a != b ? a < b : left.size() < right.size();
}

}  // namespace quorvel::detail
