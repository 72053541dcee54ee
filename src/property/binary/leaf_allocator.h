// The memory of a reader's leaves: side by side in blocks that each share one count, so that reading and releasing a
// file costs no allocation for each value. A value that outlives the rest of its file keeps its block alive: at most
// `kBlockSize` bytes; a leaf larger than `kLargestShared` has memory and a count of its own.
#pragma once

#include <cstddef>
#include <cstdint>
#include <new>
#include <utility>

#include "property/node.h"

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

  /// The free part of the newest block, for a caller that puts leaves there by itself.
  struct Room {
    char* at;
    char* end;
    const char* block;
  };
  [[nodiscard]] Room room() const noexcept { return {at_, end_, reinterpret_cast<const char*>(newest_)}; }
  /// Takes the free part back from that caller; leaves lie in it up to `room.at`.
  void fill(const Room& room) noexcept { at_ = room.at; }

  /// A leaf whose bytes the caller fills in, or null. A leaf of its own memory comes with one reference; a leaf in a
  /// block with none: it lives at least as long as this allocator.
  [[nodiscard]] BytesNode* add_bytes(PropertyKind kind, std::size_t length, std::uint8_t flags) noexcept {
    if (length > kLargestShared) return new_bytes(kind, length, flags);
    void* memory = take(BytesNode::allocation(length));
    if (memory == nullptr) return nullptr;
    return new (memory) BytesNode{{distance(memory), kind, static_cast<std::uint8_t>(flags | kInBlock), 0},
                                  static_cast<std::uint32_t>(length)};
  }

 private:
  [[nodiscard]] void* take(std::size_t size) noexcept {
    size = (size + 7) & ~std::size_t{7};
    if (static_cast<std::size_t>(end_ - at_) < size && !add_block(size)) return nullptr;
    return std::exchange(at_, at_ + size);
  }
  [[nodiscard]] bool add_block(std::size_t size) noexcept;
  [[nodiscard]] std::uint32_t distance(const void* node) const noexcept {
    return static_cast<std::uint32_t>((static_cast<const char*>(node) - reinterpret_cast<const char*>(newest_)) / 8);
  }

  Block* newest_ = nullptr;
  char* at_ = nullptr;
  char* end_ = nullptr;
  std::size_t block_size_ = kBlockSize;
};

}  // namespace quorvel::detail
