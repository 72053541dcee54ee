// Gathers references to leaves of one block, to take or drop them in one step.
#pragma once

#include <cstdint>

#include "property/node.h"

namespace quorvel::detail {

/// Takes the references that were gathered.
struct TakeReferences {
  void operator()(Block* block, std::uint64_t references) const noexcept {
    block->count.fetch_add(references, std::memory_order_relaxed);
  }
};
/// Drops them, and with the last one the block.
struct DropReferences {
  void operator()(Block* block, std::uint64_t references) const noexcept { release_block(block, references); }
};

template <class Settle>
class BlockRun {
 public:
  BlockRun() noexcept = default;
  BlockRun(const BlockRun&) = delete;
  BlockRun& operator=(const BlockRun&) = delete;
  ~BlockRun() { settle(); }

  /// Gathers a reference to a leaf that lies in a block. Only a leaf of another block than the last one's is looked at.
  void add(const Node* leaf) noexcept { add_masked(leaf, ~Word{0}); }
  /// The same where `mask` has all bits set; adds nothing where it has none. The mask is not branched on: without bits
  /// it makes the distance 0, which lies inside every block, since `size_` is never 0.
  void add_masked(const Node* leaf, Word mask) noexcept {
    if (((word_of(leaf) - reinterpret_cast<Word>(block_)) & mask) >= size_) move_to(leaf);
    references_ += mask & 1;
  }

 private:
  void move_to(const Node* leaf) noexcept {
    settle();
    block_ = block_of(leaf);
    size_ = block_->size;
    references_ = 0;
  }
  void settle() noexcept {
    if (references_ > 0) Settle{}(block_, references_);
  }

  Block* block_ = nullptr;
  std::size_t size_ = 1;
  std::uint64_t references_ = 0;
};

}  // namespace quorvel::detail
