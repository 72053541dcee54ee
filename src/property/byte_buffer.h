// A growing run of bytes that reports a failed allocation instead of throwing.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <span>
#include <string_view>
#include <utility>

namespace quorvel {

class ByteBuffer {
 public:
  ByteBuffer() noexcept = default;
  ByteBuffer(ByteBuffer&& other) noexcept
      : data_(std::exchange(other.data_, nullptr)),
        size_(std::exchange(other.size_, 0)),
        capacity_(std::exchange(other.capacity_, 0)) {}
  ByteBuffer& operator=(ByteBuffer&& other) noexcept {
    std::swap(data_, other.data_);
    std::swap(size_, other.size_);
    std::swap(capacity_, other.capacity_);
    return *this;
  }
  ~ByteBuffer() { std::free(data_); }

  [[nodiscard]] std::byte* data() noexcept { return data_; }
  [[nodiscard]] const std::byte* data() const noexcept { return data_; }
  [[nodiscard]] std::size_t size() const noexcept { return size_; }
  [[nodiscard]] std::size_t capacity() const noexcept { return capacity_; }
  [[nodiscard]] bool empty() const noexcept { return size_ == 0; }
  [[nodiscard]] std::span<const std::byte> bytes() const noexcept { return {data_, size_}; }

  /// Makes room for `capacity` bytes in all; false, and nothing changed, when memory runs out.
  [[nodiscard]] bool reserve(std::size_t capacity) noexcept {
    if (capacity <= capacity_) return true;
    void* grown = std::realloc(data_, capacity);
    if (grown == nullptr) return false;
    data_ = static_cast<std::byte*>(grown);
    capacity_ = capacity;
    return true;
  }
  /// Sets the size; new bytes are not initialised. False, and nothing changed, when memory runs out.
  [[nodiscard]] bool resize(std::size_t size) noexcept {
    if (!reserve(size)) return false;
    size_ = size;
    return true;
  }
  /// Adds bytes, doubling the room when it is used up; false, and nothing changed, when memory runs out.
  [[nodiscard]] bool append(const void* bytes, std::size_t count) noexcept {
    if (count > capacity_ - size_ && !reserve(size_ + count > capacity_ * 2 ? size_ + count : capacity_ * 2)) {
      return false;
    }
    if (count > 0) std::memcpy(data_ + size_, bytes, count);
    size_ += count;
    return true;
  }
  [[nodiscard]] bool append(std::string_view text) noexcept { return append(text.data(), text.size()); }
  /// Drops the first `count` bytes.
  void consume(std::size_t count) noexcept {
    size_ -= count;
    if (size_ > 0) std::memmove(data_, data_ + count, size_);
  }
  /// Forgets the content, and the memory as well where it is larger than `keep`.
  void clear(std::size_t keep = SIZE_MAX) noexcept {
    size_ = 0;
    if (capacity_ > keep) *this = ByteBuffer{};
  }

 private:
  std::byte* data_ = nullptr;
  std::size_t size_ = 0;
  std::size_t capacity_ = 0;
};

}  // namespace quorvel
