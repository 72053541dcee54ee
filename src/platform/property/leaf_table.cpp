#include "platform/property/leaf_table.h"

#include <algorithm>

namespace quorvel::detail {

namespace {

std::uint32_t hash_bits(std::uint64_t bits) noexcept {
  return static_cast<std::uint32_t>(mix(bits ^ kHashSeed, 0x9e3779b97f4a7c15) >> 16);
}

std::uint32_t hash_leaf(Word leaf) noexcept {
  if (!is_node(leaf)) return hash_bits(leaf);
  switch (node_of(leaf)->kind) {
    case PropertyKind::string: return hash_text(text_of(leaf));
    case PropertyKind::data: return ~hash_text(text_of(leaf));
    default: return hash_bits(static_cast<const NumberNode*>(node_of(leaf))->bits);
  }
}

bool same_leaf(Word left, Word right) noexcept {
  if (left == right) return true;
  if (!is_node(left) || !is_node(right)) return false;
  const Node* a = node_of(left);
  const Node* b = node_of(right);
  if (a->kind != b->kind) return false;
  if (a->kind == PropertyKind::string || a->kind == PropertyKind::data) return text_of(left) == text_of(right);
  return static_cast<const NumberNode*>(a)->bits == static_cast<const NumberNode*>(b)->bits &&
         (a->flags & kUnsigned) == (b->flags & kUnsigned);
}

}  // namespace

bool LeafTable::resize(std::size_t size) noexcept {
  auto* slots = static_cast<Slot*>(std::calloc(size, sizeof(Slot)));
  if (slots == nullptr) return false;
  for (std::size_t i = 0; i < size_; ++i) {
    if (slots_[i].leaf == 0) continue;
    std::size_t at = slots_[i].hash & (size - 1);
    while (slots[at].leaf != 0) at = (at + 1) & (size - 1);
    slots[at] = slots_[i];
  }
  std::free(slots_);
  slots_ = slots;
  size_ = size;
  return true;
}

LeafTable::Outcome LeafTable::find_or_add(Word leaf, std::uint32_t& number) noexcept {
  if (used_ * 2 >= size_ && !resize(std::max<std::size_t>(64, size_ * 2))) return Outcome::no_memory;
  const std::uint32_t hash = hash_leaf(leaf);
  std::size_t at = hash & (size_ - 1);
  for (; slots_[at].leaf != 0; at = (at + 1) & (size_ - 1)) {
    if (slots_[at].hash == hash && same_leaf(slots_[at].leaf, leaf)) {
      number = slots_[at].number;
      return Outcome::found;
    }
  }
  slots_[at] = {leaf, hash, number};
  ++used_;
  return Outcome::added;
}

}  // namespace quorvel::detail
