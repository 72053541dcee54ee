#include "property/binary/leaf_table.h"

#include <algorithm>

namespace quorvel::detail {

namespace {

std::uint32_t hash_leaf(Word leaf) noexcept {
  if (is_node(leaf)) return hash_text(text_of(leaf));
  return static_cast<std::uint32_t>(mix(leaf ^ kHashSeed, 0x9e3779b97f4a7c15) >> 16);
}

bool same_leaf(Word left, Word right) noexcept {
  if (left == right) return true;
  return is_node(left) && is_node(right) && node_of(left)->kind == node_of(right)->kind &&
         text_of(left) == text_of(right);
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

LeafTable::Outcome LeafTable::search(Word leaf, std::uint32_t& number) noexcept {
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
