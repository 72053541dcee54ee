// A row that grows at its end and reports a failed allocation instead of throwing, for plain types.
#pragma once

#include <cstddef>
#include <cstdlib>
#include <type_traits>

namespace quorvel::detail {

template <class T>
class GrowingRow {
 public:
  static_assert(std::is_trivially_copyable_v<T>);
  GrowingRow() noexcept = default;
  GrowingRow(const GrowingRow&) = delete;
  GrowingRow& operator=(const GrowingRow&) = delete;
  ~GrowingRow() { std::free(items_); }

  [[nodiscard]] std::size_t size() const noexcept { return size_; }
  [[nodiscard]] std::size_t room() const noexcept { return room_; }
  [[nodiscard]] T& operator[](std::size_t index) noexcept { return items_[index]; }
  [[nodiscard]] const T& operator[](std::size_t index) const noexcept { return items_[index]; }

  /// Makes room for `room` items in all, which must be no fewer than there are. False, and nothing changed, when memory
  /// runs out.
  [[nodiscard]] bool reserve(std::size_t room) noexcept {
    void* grown = std::realloc(items_, room * sizeof(T));
    if (grown == nullptr) return false;
    items_ = static_cast<T*>(grown);
    room_ = room;
    return true;
  }
  /// Adds an item, doubling the room when it is used up; false, and nothing changed, when memory runs out.
  [[nodiscard]] bool add(const T& item) noexcept {
    if (size_ == room_ && !reserve(room_ == 0 ? 16 : room_ * 2)) return false;
    items_[size_++] = item;
    return true;
  }
  /// To be called when items behind the last have been filled in by hand: there are `size` in all now, within the room.
  void set_size(std::size_t size) noexcept { size_ = size; }

 private:
  T* items_ = nullptr;
  std::size_t size_ = 0;
  std::size_t room_ = 0;
};

}  // namespace quorvel::detail
