// The word that stands for an object while its file is read.
#pragma once

#include "property/node.h"

namespace quorvel::detail {

inline constexpr Word kBlockTag = 2;  // of a node: a leaf in a block
inline constexpr Word kTextTag = 4;   // of a node: a text
static_assert((kBlockTag | kTextTag | kImmediateBit) == kTagMask, "a node's address leaves these bits free");

/// A value's word and, for a node, two tags that say what a container needs to know of it. Many files are larger than
/// the processor's caches: a container is made without touching its elements, which are far away by then.
struct MadeWord {
  Word bits;  // 0 for no object

  /// A container that is not made yet, and one whose elements are being made: immediates of a tag that no value has.
  [[nodiscard]] static constexpr MadeWord unmade() noexcept { return {5}; }
  [[nodiscard]] static constexpr MadeWord in_the_making() noexcept { return {5 | 8}; }
  /// The word of a leaf, with its tags.
  [[nodiscard]] static MadeWord of_leaf(Word word) noexcept {
    if (!is_node(word)) return {word};
    const Node& node = *node_of(word);
    return {word | ((node.flags & kInBlock) != 0 ? kBlockTag : 0) | (node.kind == PropertyKind::string ? kTextTag : 0)};
  }

  [[nodiscard]] bool operator==(const MadeWord&) const noexcept = default;
  [[nodiscard]] bool is_text() const noexcept { return (bits & (kImmediateBit | kTextTag)) == kTextTag; }
  [[nodiscard]] bool has_own_count() const noexcept { return (bits & (kImmediateBit | kBlockTag)) == 0; }
  /// All bits set for a node, none for an immediate.
  [[nodiscard]] Word node_mask() const noexcept { return (bits & kImmediateBit) - 1; }
  /// The value's word.
  [[nodiscard]] Word plain() const noexcept { return bits & ~(node_mask() & (kBlockTag | kTextTag)); }
};
static_assert(sizeof(MadeWord) == sizeof(Word));
static_assert((MadeWord::unmade().bits & kTagMask) != kIntegerTag &&
              (MadeWord::unmade().bits & kTagMask) != kBooleanTag);

}  // namespace quorvel::detail
