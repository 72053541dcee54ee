#include "platform/property/leaf_allocator.h"

#include <algorithm>
#include <cstdlib>
#include <limits>
#include <new>

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

bool LeafAllocator::add_block() noexcept {
  void* memory = std::malloc(block_size_);
  if (memory == nullptr) return false;
  auto* block = new (memory) Block{1, newest_};
  newest_ = block;
  at_ = static_cast<char*>(memory) + sizeof(Block);
  end_ = static_cast<char*>(memory) + block_size_;
  return true;
}

void* LeafAllocator::take(std::size_t size) noexcept {
  size = (size + 7) & ~std::size_t{7};
  if (static_cast<std::size_t>(end_ - at_) < size) {
    // A leaf that a small file's block has no room for gets a block of the common size.
    if (sizeof(Block) + size > block_size_) block_size_ = kBlockSize;
    if (!add_block()) return nullptr;
  }
  void* taken = at_;
  at_ += size;
  return taken;
}

std::uint32_t LeafAllocator::distance(const void* node) const noexcept {
  return static_cast<std::uint32_t>((static_cast<const char*>(node) - reinterpret_cast<const char*>(newest_)) / 8);
}

BytesNode* LeafAllocator::add_bytes(PropertyKind kind, std::size_t length, std::uint8_t flags) noexcept {
  if (length > std::numeric_limits<std::uint32_t>::max()) return nullptr;
  const bool shared = length <= kLargestShared;
  void* memory = shared ? take(BytesNode::kBytesOffset + length) : std::malloc(BytesNode::kBytesOffset + length);
  if (memory == nullptr) return nullptr;
  return new (memory)
      BytesNode{{shared ? distance(memory) : 1, kind, static_cast<std::uint8_t>(flags | (shared ? kInBlock : 0)), 0},
                static_cast<std::uint32_t>(length)};
}

Word LeafAllocator::add_number(PropertyKind kind, std::uint64_t bits, std::uint8_t flags) noexcept {
  void* memory = take(sizeof(NumberNode));
  if (memory == nullptr) return 0;
  auto* node = new (memory) NumberNode{{distance(memory), kind, static_cast<std::uint8_t>(flags | kInBlock), 0}, {}};
  node->bits = bits;
  return word_of(node);
}

}  // namespace quorvel::detail
