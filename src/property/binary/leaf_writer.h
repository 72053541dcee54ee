// How each kind of leaf is put into a file. Every function here writes at `at`, where there must be room for
// `leaf_room` bytes, and returns where it ended.
#pragma once

#include <algorithm>
#include <array>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>

#include "property/binary/format.h"
#include "property/binary/layout.h"
#include "property/binary/short_text.h"
#include "property/node.h"
#include "property/unicode.h"

namespace quorvel::detail {

/// Room for every leaf but the bytes of a text or data value, in bytes.
inline constexpr std::size_t kLeafRoom = 72;

/// Room that is enough for putting a leaf, in bytes.
[[nodiscard]] inline std::size_t leaf_room(Word word) noexcept {
  // A character of UTF-8 takes at most two bytes of UTF-16 for each of its own.
  return is_node(word) ? kLeafRoom + std::size_t{bytes_of(word)->length} * 2 : kLeafRoom;
}

// A leaf that is put without a branch may write beyond its end: the next object, or the offset table, overwrites that.

/// The width of the smallest integer that holds `bits`, as a power of two.
[[nodiscard]] inline unsigned width_exponent(std::uint64_t bits) noexcept {
  // A table, because compilers make branches of comparisons.
  static constexpr auto kExponents = [] {
    std::array<std::uint8_t, 65> exponents{};
    for (std::size_t i = 0; i < exponents.size(); ++i) {
      exponents[i] = static_cast<std::uint8_t>(i <= 8 ? 0 : i <= 16 ? 1 : i <= 32 ? 2 : 3);
    }
    return exponents;
  }();
  return kExponents[static_cast<std::size_t>(std::bit_width(bits | 1))];
}

inline std::byte* put_integer(std::byte* at, std::int64_t value) noexcept {
  const auto bits = static_cast<std::uint64_t>(value);
  const unsigned exponent = width_exponent(bits);
  const unsigned width = 1U << exponent;
  *at = static_cast<std::byte>(unsigned{binary_format::kInteger} << 4 | exponent);
  binary_format::put_integer(at + 1, bits << (64 - 8 * width), 8);
  return at + 1 + width;
}

inline std::byte* put_marker(std::byte* at, unsigned kind, std::uint64_t size) noexcept {
  const bool is_long = size >= binary_format::kLongSize;
  *at = static_cast<std::byte>(kind << 4 | (is_long ? binary_format::kLongSize : static_cast<unsigned>(size)));
  std::byte* const end = put_integer(at + 1, static_cast<std::int64_t>(size));
  return is_long ? end : at + 1;
}

/// Whether a leaf is of those that a file is mostly made of: `put_short_leaf` puts it without a branch.
[[nodiscard]] inline bool is_short_leaf(const BytesNode& leaf) noexcept {
  return (leaf.flags & kVerbatim) != 0 && leaf.length <= kShortText;
}

/// What stands before the bytes of a short leaf: its marker, and its length where the marker has no room for it.
struct ShortHead {
  std::array<std::uint8_t, 3> bytes;
  std::uint8_t size;  // how many of the bytes
};

/// A power of two, so that a head is found by a shift.
inline constexpr std::size_t kHeadsOfAKind = std::bit_ceil(kShortText + 1);
static_assert(kHeadsOfAKind > 16, "the widest number is a short leaf");
static_assert(kShortText <= UINT8_MAX, "the length of a short leaf fits its head");
static_assert(static_cast<std::size_t>(PropertyKind::data) < 8, "every kind of leaf has its heads");

/// By kind and length.
inline constexpr auto kShortHeads = [] {
  namespace format = binary_format;
  std::array<std::array<ShortHead, kHeadsOfAKind>, 8> heads{};
  const auto set = [&](PropertyKind kind, std::size_t length, unsigned high, std::size_t low) {
    heads[static_cast<std::size_t>(kind)][length] = {
        {static_cast<std::uint8_t>(high << 4 | low), format::kInteger << 4, static_cast<std::uint8_t>(length)},
        static_cast<std::uint8_t>(low < format::kLongSize ? 1 : 3)};
  };
  for (std::size_t n = 0; n <= kShortText; ++n) {
    set(PropertyKind::string, n, format::kAsciiText, std::min<std::size_t>(n, format::kLongSize));
    set(PropertyKind::data, n, format::kData, std::min<std::size_t>(n, format::kLongSize));
  }
  for (unsigned n = 0; n <= 4; ++n) set(PropertyKind::integer, std::size_t{1} << n, format::kInteger, n);
  set(PropertyKind::real, 8, format::kReal, 3);
  set(PropertyKind::date, 8, format::kDate >> 4, format::kDate & 15);
  return heads;
}();

/// An integer that is held in a word, as a leaf whose bytes are those that stand in a file.
struct IntegerLeaf : BytesNode {
  explicit IntegerLeaf(Word word) noexcept : BytesNode{{0, PropertyKind::integer, kVerbatim, 0}, 0} {
    const auto bits = static_cast<std::uint64_t>(immediate_value(word));
    length = 1U << width_exponent(bits);
    binary_format::put_integer(reinterpret_cast<std::byte*>(bytes()), bits << (64 - 8 * length), 8);
  }
  char room[BytesNode::allocation(8) - BytesNode::kBytesOffset];
};
static_assert(sizeof(IntegerLeaf) >= BytesNode::allocation(8), "it can be read like any short leaf");

// A short leaf is written in chunks, and its head whole, whatever they really take.
static_assert(kLeafRoom >= kLongHead + std::max(kShortText, sizeof(Chunk)), "a short leaf stays within the room");
static_assert(kLeafRoom >= sizeof(ShortHead));
static_assert(kLeafRoom >= 2 + 8, "so does a marker with a size of eight bytes");

inline std::byte* put_short_leaf(std::byte* at, const BytesNode& leaf) noexcept {
  const std::size_t length = leaf.length;
  const ShortHead& head = kShortHeads[static_cast<std::size_t>(leaf.kind)][length];
  std::memcpy(at, &head, sizeof head);
  at += head.size;
  const char* from = leaf.bytes();
  visit_chunks(length, [=](std::size_t offset) { std::memcpy(at + offset, from + offset, sizeof(Chunk)); });
  return at + length;
}

inline std::byte* put_wide_text(std::byte* at, const BytesNode& text) noexcept {
  return write_utf16(text.view(), put_marker(at, binary_format::kUtf16Text, utf16_units(text.view())));
}

/// Puts a leaf of any kind and size, step by step: the plain reference for `put_short_leaf`.
inline std::byte* put_plain_leaf(std::byte* at, Word word) noexcept {
  namespace format = binary_format;
  const BytesNode& leaf = *bytes_of(word);
  if ((leaf.flags & kVerbatim) == 0) return put_wide_text(at, leaf);
  switch (leaf.kind) {
    case PropertyKind::string: at = put_marker(at, format::kAsciiText, leaf.length); break;
    case PropertyKind::data: at = put_marker(at, format::kData, leaf.length); break;
    case PropertyKind::date: *at++ = std::byte{format::kDate}; break;
    default: {
      const unsigned kind = leaf.kind == PropertyKind::real ? format::kReal : format::kInteger;
      *at++ = static_cast<std::byte>(kind << 4 | static_cast<unsigned>(std::countr_zero(leaf.length)));
    }
  }
  if (leaf.length > 0) std::memcpy(at, leaf.bytes(), leaf.length);
  return at + leaf.length;
}

/// Puts a leaf; there must be room for `leaf_room` bytes. Returns where it ends.
inline std::byte* put_leaf(std::byte* at, Word word) noexcept {
  namespace format = binary_format;
  if (!is_node(word)) {
    if (kind_of(word) == PropertyKind::integer) return put_integer(at, immediate_value(word));
    *at = static_cast<std::byte>(word == kTrue ? format::kTrue : format::kFalse);
    return at + 1;
  }
  return is_short_leaf(*bytes_of(word)) ? put_short_leaf(at, *bytes_of(word)) : put_plain_leaf(at, word);
}

}  // namespace quorvel::detail
