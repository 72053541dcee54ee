// Recognises, without a branch, the objects that files are mostly made of: short leaves.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>

#include "property/binary/layout.h"
#include "property/binary/made_word.h"
#include "property/binary/short_text.h"

namespace quorvel::detail {

/// The facts that a marker tells about a short leaf. Masks have all bits set or none.
struct alignas(8) LeafMarker {
  std::uint8_t size;       // in bytes, unless it is long; above `kShortText` for every other object
  std::uint8_t long_mask;  // whether the size stands in an integer object behind the marker
  std::uint8_t head;       // bytes before those of the leaf
  PropertyKind kind;
  std::int8_t text_mask;       // whether the leaf is a text
  std::int8_t immediate_mask;  // whether a word holds the leaf
  std::int8_t value_mask;      // of the bits in that word
  std::uint8_t tags;           // of that word, or of the MadeWord of the node
};

/// The short leaves' share of `kMarkers`. An integer of eight bytes is left out, because no word may hold it, a real of
/// four bytes, because it is stored in eight, and a text in UTF-16, because it is stored in UTF-8.
[[nodiscard]] constexpr LeafMarker leaf_marker(unsigned byte) noexcept {
  namespace format = binary_format;
  constexpr LeafMarker kNone = {UINT8_MAX, 0, 1, PropertyKind::none, 0, 0, 0, 0};
  const Marker marker = kMarkers[byte];
  const std::uint8_t long_mask = marker.is_long ? 0xff : 0, head = marker.is_long ? kLongHead : 1;
  const bool is_number = marker.size == 8;
  if (marker.unit != Marker::kByte) return kNone;
  switch (byte >> 4) {
    // A boolean's only byte is its marker: the lowest bit tells them apart.
    case format::kFalse >> 4: return {1, 0, 0, PropertyKind::boolean, 0, -1, 1, kBooleanTag};
    case format::kInteger:
      return marker.size <= 4 ? LeafMarker{marker.size, 0, 1, PropertyKind::integer, 0, -1, -1, kIntegerTag} : kNone;
    case format::kReal: return is_number ? LeafMarker{8, 0, 1, PropertyKind::real, 0, 0, 0, kBlockTag} : kNone;
    case format::kDate >> 4: return {8, 0, 1, PropertyKind::date, 0, 0, 0, kBlockTag};
    case format::kData: return {marker.size, long_mask, head, PropertyKind::data, 0, 0, 0, kBlockTag};
    case format::kAsciiText:
      return {marker.size, long_mask, head, PropertyKind::string, -1, 0, 0, kBlockTag | kTextTag};
    default: return kNone;
  }
}
static_assert((binary_format::kFalse & 1) == 0 && (binary_format::kTrue & 1) == 1);
static_assert(kFalse == kBooleanTag && kTrue == (kBooleanTag | 1 << 3), "a boolean's word is its marker's bit, tagged");

/// By the byte that a marker is.
inline constexpr auto kLeafMarkers = [] {
  std::array<LeafMarker, 256> markers{};
  for (unsigned byte = 0; byte < markers.size(); ++byte) markers[byte] = leaf_marker(byte);
  return markers;
}();

struct ShortLeaf {
  LeafMarker marker;
  std::size_t size;  // in bytes
  const std::byte* body;
};

/// The bytes that may be read from the marker of a short leaf on: those before the leaf's own, and the leaf's.
inline constexpr std::size_t kLargestShortObject = kLongHead + kShortText;
static_assert(kShortText < UINT8_MAX, "a marker's size can say that it is none of a short leaf");
static_assert(kShortText >= sizeof(Chunk), "a chunk at the beginning of the shortest leaf can be read");

/// Finds out whether a short leaf begins at `at`, behind which at least `kLargestShortObject` bytes can be read.
[[nodiscard]] inline bool find_short_leaf(const std::byte* at, ShortLeaf& leaf) noexcept {
  leaf.marker = kLeafMarkers[static_cast<std::size_t>(*at)];
  const LeafMarker& marker = leaf.marker;
  leaf.size = (marker.size & ~marker.long_mask) | (static_cast<std::size_t>(at[2]) & marker.long_mask);
  leaf.body = at + marker.head;
  const auto odd_size = static_cast<unsigned>(at[1] ^ kOneByteInteger) & marker.long_mask;
  return leaf.size <= kShortText && odd_size == 0;
}

/// Not 0 when `leaf` is a text with a byte above 0x7f, `all` being all its chunks together.
[[nodiscard]] inline std::uint64_t foreign_bits(const ShortLeaf& leaf, Chunk all) noexcept {
  return high_bits(all, leaf.size) & static_cast<std::uint64_t>(std::int64_t{leaf.marker.text_mask});
}

}  // namespace quorvel::detail
