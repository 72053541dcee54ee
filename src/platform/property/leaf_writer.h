// How each kind of leaf is put into a file. Every function here writes at `at`, where there must be room for
// `leaf_room` bytes, and returns where it ended.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>

#include "platform/property/binary_format.h"
#include "platform/property/node.h"
#include "platform/property/short_text.h"
#include "platform/property/unicode.h"

namespace quorvel::detail {

/// Room for every leaf but the bytes of a text or data value, in bytes.
inline constexpr std::size_t kLeafRoom = 64;

[[nodiscard]] inline bool holds_bytes(Word word) noexcept {
  const PropertyKind kind = node_of(word)->kind;
  return kind == PropertyKind::string || kind == PropertyKind::data;
}

/// Room that is enough for putting a leaf, in bytes.
[[nodiscard]] inline std::size_t leaf_room(Word word) noexcept {
  // A character of UTF-8 takes at most two bytes of UTF-16 for each of its own.
  return is_node(word) && holds_bytes(word) ? kLeafRoom + std::size_t{bytes_of(word)->length} * 2 : kLeafRoom;
}

// What is written without a branch may reach beyond the leaf: it is overwritten by what comes next.

inline std::byte* put_bytes(std::byte* at, const BytesNode& node) noexcept {
  const char* from = node.bytes();
  const std::size_t length = node.length;
  if (length <= kShortText) {
    visit_words(length, [=](std::size_t offset) { std::memcpy(at + offset, from + offset, 8); });
  } else if (length <= 64) {
    std::memcpy(at, from, 32);
    std::memcpy(at + length - 32, from + length - 32, 32);
  } else {
    std::memcpy(at, from, length);
  }
  return at + length;
}

/// The width of the smallest integer that holds `bits`, as a power of two.
[[nodiscard]] inline unsigned width_exponent(std::uint64_t bits) noexcept {
  return (bits > 0xff ? 1U : 0U) + (bits > 0xffff ? 1U : 0U) + (bits > 0xffff'ffff ? 1U : 0U);
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

inline std::byte* put_wide_text(std::byte* at, const BytesNode& text) noexcept {
  return write_utf16(text.view(), put_marker(at, binary_format::kUtf16Text, utf16_units(text.view())));
}

// An integer beyond what a word holds, a real or a date.
inline std::byte* put_number(std::byte* at, const NumberNode& number) noexcept {
  namespace format = binary_format;
  if (number.kind == PropertyKind::date || number.kind == PropertyKind::real) {
    *at++ = static_cast<std::byte>(number.kind == PropertyKind::date ? format::kDate : format::kReal << 4 | 3);
  } else if ((number.flags & kUnsigned) == 0) {
    return put_integer(at, static_cast<std::int64_t>(number.bits));
  } else {
    *at++ = static_cast<std::byte>(format::kInteger << 4 | 4);
    format::put_integer(at, 0, 8);
    at += 8;
  }
  format::put_integer(at, number.bits, 8);
  return at + 8;
}

/// Puts a leaf; there must be room for `leaf_room` bytes. Returns where it ends.
inline std::byte* put_leaf(std::byte* at, Word word) noexcept {
  namespace format = binary_format;
  if (!is_node(word)) {
    if (kind_of(word) == PropertyKind::integer) return put_integer(at, immediate_value(word));
    *at = static_cast<std::byte>(word == kTrue ? format::kTrue : format::kFalse);
    return at + 1;
  }
  if (!holds_bytes(word)) return put_number(at, *static_cast<const NumberNode*>(node_of(word)));
  const BytesNode& bytes = *bytes_of(word);
  const bool is_data = bytes.kind == PropertyKind::data;
  if (!is_data && (bytes.flags & kAscii) == 0) return put_wide_text(at, bytes);
  return put_bytes(put_marker(at, is_data ? format::kData : format::kAsciiText, bytes.length), bytes);
}

}  // namespace quorvel::detail
