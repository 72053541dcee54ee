// Where a reader's leaves lie: side by side in blocks that each share one count, so that reading and releasing a file
// costs no allocation for each value. A value that outlives the rest of its file keeps its block alive: at most
// `kBlockSize` bytes; a leaf larger than `kLargestShared` has memory and a count of its own.
#pragma once

#include <cstddef>
#include <cstdint>

#include "platform/property/node.h"

namespace quorvel::detail {

class LeafAllocator {
 public:
  static constexpr std::size_t kBlockSize = std::size_t{64} << 10;
  static constexpr std::size_t kLargestShared = std::size_t{4} << 10;

  LeafAllocator() noexcept = default;
  LeafAllocator(const LeafAllocator&) = delete;
  LeafAllocator& operator=(const LeafAllocator&) = delete;
  /// Lets go of the blocks; those whose leaves nobody took a reference to are freed.
  ~LeafAllocator();

  /// Prepares for a file of `file_size` bytes: a small file gets a small block.
  void start(std::size_t file_size) noexcept;

  /// A leaf whose bytes the caller fills in, or null. A leaf of its own memory comes with one reference; a leaf in a
  /// block with none: it lives at least as long as this allocator.
  [[nodiscard]] BytesNode* add_bytes(PropertyKind kind, std::size_t length, std::uint8_t flags) noexcept;
  /// 0 when memory runs out.
  [[nodiscard]] Word add_number(PropertyKind kind, std::uint64_t bits, std::uint8_t flags) noexcept;

 private:
  [[nodiscard]] void* take(std::size_t size) noexcept;
  [[nodiscard]] bool add_block() noexcept;
  [[nodiscard]] std::uint32_t distance(const void* node) const noexcept;

  Block* newest_ = nullptr;
  char* at_ = nullptr;
  char* end_ = nullptr;
  std::size_t block_size_ = kBlockSize;
};

}  // namespace quorvel::detail
