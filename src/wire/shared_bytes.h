// Bytes that several holders share and none changes. Different SharedBytes may be used from different threads at once.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <new>
#include <span>
#include <utility>

#include "property/byte_buffer.h"

namespace quorvel::wire {

class SharedBytes {
 public:
  SharedBytes() noexcept = default;
  SharedBytes(const SharedBytes& other) noexcept : block_(other.block_) {
    if (block_ != nullptr) block_->count.fetch_add(1, std::memory_order_relaxed);
  }
  SharedBytes(SharedBytes&& other) noexcept : block_(std::exchange(other.block_, nullptr)) {}
  SharedBytes& operator=(SharedBytes other) noexcept {
    std::swap(block_, other.block_);
    return *this;
  }
  ~SharedBytes() {
    if (block_ != nullptr && block_->count.fetch_sub(1, std::memory_order_acq_rel) == 1) delete block_;
  }

  /// Takes over the content of `bytes`; empty, and `bytes` as it was, when memory runs out. Unused room is
  /// given back where it is more than half of the whole.
  [[nodiscard]] static SharedBytes take(ByteBuffer& bytes) noexcept {
    SharedBytes result;
    result.block_ = new (std::nothrow) Block;
    if (result.block_ == nullptr) return result;
    if (bytes.size() >= bytes.capacity() / 2) {
      result.block_->bytes = std::move(bytes);
    } else if (result.block_->bytes.append(bytes.data(), bytes.size())) {
      bytes.clear();
    } else {
      delete std::exchange(result.block_, nullptr);
    }
    return result;
  }

  [[nodiscard]] explicit operator bool() const noexcept { return block_ != nullptr; }
  [[nodiscard]] std::span<const std::byte> bytes() const noexcept {
    return block_ != nullptr ? block_->bytes.bytes() : std::span<const std::byte>{};
  }
  /// True when nobody else holds these bytes, for a holder that nobody else copies from meanwhile.
  [[nodiscard]] bool is_sole_holder() const noexcept {
    return block_ != nullptr && block_->count.load(std::memory_order_acquire) == 1;
  }

 private:
  struct Block {
    std::atomic<std::uint32_t> count = 1;
    ByteBuffer bytes;
  };
  Block* block_ = nullptr;
};

}  // namespace quorvel::wire
