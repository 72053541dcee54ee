#include "property/binary/leaf_allocator.h"

#include <algorithm>
#include <cstdlib>

namespace quorvel::detail {

LeafAllocator::~LeafAllocator() {
  while (newest_ != nullptr) {
    Block* block = newest_;
    newest_ = block->previous;
    release_block(block, 1);
  }
}

void LeafAllocator::start(std::size_t file_size) noexcept {
  // A leaf takes more in memory than in the file, at most about this much more in files of the common kind.
  block_size_ = std::clamp(file_size * 2, std::size_t{256}, kBlockSize);
}

bool LeafAllocator::add_block(std::size_t size) noexcept {
  // A leaf that a small file's block has no room for gets a block of the common size.
  if (sizeof(Block) + size > block_size_) block_size_ = kBlockSize;
  void* memory = std::malloc(block_size_);
  if (memory == nullptr) return false;
  newest_ = new (memory) Block{1, newest_, block_size_};
  at_ = static_cast<char*>(memory) + sizeof(Block);
  end_ = static_cast<char*>(memory) + block_size_;
  return true;
}

}  // namespace quorvel::detail
