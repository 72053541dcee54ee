// How each kind of leaf is made of its object in a file.
#pragma once

#include <bit>
#include <cstdint>
#include <cstring>

#include "platform/property/binary_layout.h"
#include "platform/property/leaf_allocator.h"
#include "platform/property/short_text.h"
#include "platform/property/unicode.h"

namespace quorvel::detail {

/// Copies the bytes of a text or data value into its node; returns false when one of them is above 0x7f. Eight bytes
/// can always be read, as a file does not end with an object, and be written, as they fit the smallest node.
inline bool copy_bytes(BytesNode& node, const std::byte* from, std::size_t length) noexcept {
  char* const to = node.bytes();
  if (length > kShortText) {
    std::memcpy(to, from, length);
    return is_ascii({to, length});
  }
  std::uint64_t all = 0;
  visit_words(length, [&](std::size_t offset) {
    std::uint64_t word;
    std::memcpy(&word, from + offset, sizeof word);
    std::memcpy(to + offset, &word, sizeof word);
    all |= word;
  });
  return !has_high_bits(all, length);
}

/// A text in ASCII, or data. 0 when a text is none, or memory runs out.
inline Word make_bytes(const EncodedObject& object, LeafAllocator& leaves) noexcept {
  const bool is_text = object.kind == binary_format::kAsciiText;
  BytesNode* node = leaves.add_bytes(is_text ? PropertyKind::string : PropertyKind::data, object.size,
                                     is_text ? std::uint8_t{kAscii} : std::uint8_t{0});
  if (node == nullptr) return 0;
  const bool ascii = copy_bytes(*node, object.body, object.size);
  if (ascii || !is_text) return word_of(node);
  if ((node->flags & kInBlock) == 0) release(word_of(node));
  return 0;
}

/// The leaves of less common kinds, as `make_leaf`.
[[nodiscard]] Word make_wide_text(const EncodedObject& object, LeafAllocator& leaves) noexcept;
[[nodiscard]] Word make_wide_integer(const EncodedObject& object, LeafAllocator& leaves) noexcept;
[[nodiscard]] Word make_real(const EncodedObject& object, LeafAllocator& leaves) noexcept;

/// The leaf that an object stands for, as LeafAllocator hands it out; 0 when it is not sound, or memory runs out.
inline Word make_leaf(const EncodedObject& object, LeafAllocator& leaves) noexcept {
  namespace format = binary_format;
  switch (object.kind) {
    case format::kAsciiText:
    case format::kData: return make_bytes(object, leaves);
    case format::kInteger: {
      if (object.size >= 8) return make_wide_integer(object, leaves);
      const std::uint64_t bits = format::get_integer(object.body, 8) >> (64 - 8 * object.size);
      return immediate_integer(static_cast<std::int64_t>(bits));
    }
    case format::kFalse >> 4: return object.nibble == (format::kTrue & 15) ? kTrue : kFalse;
    case format::kUtf16Text: return make_wide_text(object, leaves);
    default: return make_real(object, leaves);
  }
}

}  // namespace quorvel::detail
