// How each kind of leaf is made of its object in a file.
#pragma once

#include <array>
#include <cstdint>
#include <cstring>

#include "property/binary/binary_layout.h"
#include "property/binary/leaf_allocator.h"
#include "property/binary/short_text.h"

namespace quorvel::detail {

// What stands for an object while a file is read is a word, and for a node what a container needs to know of it: many
// files are larger than the processor's caches, and a node that was just made is already far away.
inline constexpr Word kBlockTag = 2;  // a leaf in a block
inline constexpr Word kTextTag = 4;

/// The word of a leaf with its tags.
[[nodiscard]] inline Word tagged_leaf(Word word) noexcept {
  if (!is_node(word)) return word;
  const Node& node = *node_of(word);
  return word | ((node.flags & kInBlock) != 0 ? kBlockTag : 0) | (node.kind == PropertyKind::string ? kTextTag : 0);
}

/// What a marker says of its object when that is a leaf of the kinds that files are mostly made of. Masks have all bits
/// set or none.
struct alignas(8) LeafMarker {
  std::uint8_t size;       // in bytes, unless it is long; above `kShortText` for every other object
  std::uint8_t long_mask;  // whether the size stands in an integer object behind the marker
  std::uint8_t head;       // bytes before those of the leaf
  PropertyKind kind;
  std::int8_t text_mask;       // whether the leaf is a text
  std::int8_t immediate_mask;  // whether a word holds the leaf
  std::int8_t value_mask;      // of the bits in that word
  std::uint8_t tags;           // of that word, or of the node's
};

/// By the byte that a marker is. A boolean's only byte is its marker.
inline constexpr auto kLeafMarkers = [] {
  namespace format = binary_format;
  std::array<LeafMarker, 256> markers{};
  markers.fill({0xff, 0, 1, PropertyKind::none, 0, 0, 0, 0});
  markers[format::kFalse] = markers[format::kTrue] = {1, 0, 0, PropertyKind::boolean, 0, -1, 1, kBooleanTag};
  for (std::uint8_t n = 0; n <= 2; ++n) {
    const auto size = static_cast<std::uint8_t>(1U << n);
    markers[format::kInteger << 4 | n] = {size, 0, 1, PropertyKind::integer, 0, -1, -1, kIntegerTag};
  }
  markers[format::kReal << 4 | 3] = {8, 0, 1, PropertyKind::real, 0, 0, 0, kBlockTag};
  markers[format::kDate] = {8, 0, 1, PropertyKind::date, 0, 0, 0, kBlockTag};
  for (std::uint8_t n = 0; n <= format::kLongSize; ++n) {
    const bool is_long = n == format::kLongSize;
    const std::uint8_t long_mask = is_long ? 0xff : 0, head = is_long ? 3 : 1;
    markers[format::kData << 4 | n] = {n, long_mask, head, PropertyKind::data, 0, 0, 0, kBlockTag};
    markers[format::kAsciiText << 4 | n] = {n, long_mask, head, PropertyKind::string, -1, 0, 0, kBlockTag | kTextTag};
  }
  return markers;
}();

/// A leaf that is short enough, and common enough, to be made without a branch.
struct ShortLeaf {
  LeafMarker marker;
  std::size_t size;  // in bytes
  const std::byte* body;
};

/// Finds out whether a short leaf begins at `at`, behind which at least `kLargestShortObject` bytes can be read.
[[nodiscard]] inline bool find_short_leaf(const std::byte* at, ShortLeaf& leaf) noexcept {
  leaf.marker = kLeafMarkers[static_cast<std::size_t>(*at)];
  const LeafMarker& marker = leaf.marker;
  leaf.size = (marker.size & ~marker.long_mask) | (static_cast<std::size_t>(at[2]) & marker.long_mask);
  leaf.body = at + marker.head;
  constexpr auto kOneByte = static_cast<std::byte>(binary_format::kInteger << 4);
  const auto odd_size = static_cast<unsigned>(at[1] ^ kOneByte) & marker.long_mask;
  return leaf.size <= kShortText && odd_size == 0;
}
inline constexpr std::size_t kLargestShortObject = 3 + kShortText;
inline constexpr std::ptrdiff_t kShortLeafRoom = kShortShapes[kShortText].room;

/// Not 0 when `leaf` is a text with a byte above 0x7f, `all` being all its chunks together.
[[nodiscard]] inline std::uint64_t foreign_bits(const ShortLeaf& leaf, Chunk all) noexcept {
  return high_bits(all, leaf.size) & static_cast<std::uint64_t>(std::int64_t{leaf.marker.text_mask});
}

/// Makes a short leaf in a block that has room for it, and moves `room` behind it. Returns its word with its tags, or 0
/// for a text that is none.
inline Word make_short_leaf(const ShortLeaf& leaf, LeafAllocator::Room& room) noexcept {
  const LeafMarker& marker = leaf.marker;
  const auto distance = static_cast<std::uint32_t>((room.at - room.block) / 8);
  auto* node =
      new (room.at) BytesNode{{distance, marker.kind, kVerbatim | kInBlock, 0}, static_cast<std::uint32_t>(leaf.size)};
  char* const to = node->bytes();
  const Chunk all = gather_chunks(leaf.body, leaf.size, [to](std::size_t offset, const Chunk& chunk) {
    std::memcpy(to + offset, &chunk, sizeof chunk);
  });
  if (foreign_bits(leaf, all) != 0) return 0;
  const std::uint64_t bits = binary_format::get_integer(leaf.body, 8) >> ((64 - 8 * leaf.size) & 63);
  const Word immediate_mask = static_cast<Word>(std::intptr_t{marker.immediate_mask});
  const Word immediate = (bits & static_cast<Word>(std::intptr_t{marker.value_mask})) << 3;
  room.at += kShortShapes[leaf.size].room & ~immediate_mask;
  return (word_of(node) ^ ((word_of(node) ^ immediate) & immediate_mask)) | marker.tags;
}

/// The leaf of any kind and size that an object stands for, as LeafAllocator hands it out; 0 when it is not sound, or
/// memory runs out.
[[nodiscard]] Word make_leaf(const EncodedObject& object, LeafAllocator& leaves) noexcept;

}  // namespace quorvel::detail
