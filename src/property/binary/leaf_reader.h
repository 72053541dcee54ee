// How each kind of leaf is made of its object in a file. `make_leaf` makes every leaf, and is the plain reference for
// `make_short_leaf`: both make equal leaves of what `find_short_leaf` finds.
#pragma once

#include <cstdint>
#include <cstring>

#include "property/binary/leaf_allocator.h"
#include "property/binary/made_word.h"
#include "property/binary/short_leaf.h"

namespace quorvel::detail {

/// The room in a block that makes a short leaf of any size safe to make.
inline constexpr std::ptrdiff_t kShortLeafRoom = kShortShapes[kShortText].room;
static_assert(kShortText <= LeafAllocator::kLargestShared, "a short leaf lies in a block");
static_assert(kShortLeafRoom + sizeof(Block) <= LeafAllocator::kBlockSize, "an empty block has room for one");

/// Makes a short leaf in a block with at least `kShortLeafRoom`, and moves `room` behind it. `all` becomes its chunks,
/// joined by OR, which tell whether a text is sound. A leaf that a word holds takes no room: the next one overwrites
/// it.
inline MadeWord make_short_leaf(const ShortLeaf& leaf, LeafAllocator::Room& room, Chunk& all) noexcept {
  const LeafMarker& marker = leaf.marker;
  const auto distance = static_cast<std::uint32_t>((room.at - room.block) / 8);
  auto* node =
      new (room.at) BytesNode{{distance, marker.kind, kVerbatim | kInBlock, 0}, static_cast<std::uint32_t>(leaf.size)};
  char* const to = node->bytes();
  all = gather_chunks(leaf.body, leaf.size,
                      [to](std::size_t offset, const Chunk& chunk) { std::memcpy(to + offset, &chunk, sizeof chunk); });
  // Of the eight bytes from the leaf's first on, its own are the upper ones.
  const std::uint64_t bits = binary_format::get_integer(leaf.body, 8) >> ((64 - 8 * leaf.size) & 63);
  const Word immediate_mask = static_cast<Word>(std::intptr_t{marker.immediate_mask});
  const Word immediate = (bits & static_cast<Word>(std::intptr_t{marker.value_mask})) << kTagBits;
  room.at += kShortShapes[leaf.size].room & ~immediate_mask;
  return {select(immediate_mask, immediate, word_of(node)) | marker.tags};
}

/// Makes the leaf of a sound object, as LeafAllocator hands it out; `length` is that of its bytes in memory. 0 when
/// memory runs out.
[[nodiscard]] Word make_leaf(const EncodedObject& object, std::size_t length, LeafAllocator& leaves) noexcept;

}  // namespace quorvel::detail
