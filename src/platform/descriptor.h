// An open descriptor that closes itself.
#pragma once

#include <unistd.h>

#include <cerrno>
#include <utility>

namespace quorvel {

class Descriptor {
 public:
  Descriptor() noexcept = default;
  /// Takes over `descriptor`; negative means none.
  explicit Descriptor(int descriptor) noexcept : descriptor_(descriptor) {}
  Descriptor(Descriptor&& other) noexcept : descriptor_(std::exchange(other.descriptor_, -1)) {}
  Descriptor& operator=(Descriptor&& other) noexcept {
    std::swap(descriptor_, other.descriptor_);
    return *this;
  }
  /// Closing never changes errno, so that the error which led here can still be told.
  ~Descriptor() {
    if (descriptor_ < 0) return;
    const int error = errno;
    ::close(descriptor_);
    errno = error;
  }

  [[nodiscard]] int get() const noexcept { return descriptor_; }
  [[nodiscard]] explicit operator bool() const noexcept { return descriptor_ >= 0; }
  /// Hands the descriptor over to the caller, who closes it.
  [[nodiscard]] int take() noexcept { return std::exchange(descriptor_, -1); }

 private:
  int descriptor_ = -1;
};

}  // namespace quorvel
