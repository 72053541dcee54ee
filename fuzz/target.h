// What every fuzz target shares.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <span>
#include <string_view>

namespace quorvel::fuzz {

using Bytes = std::span<const std::byte>;

/// The target itself: throws `input` at what it tests, and ends the process at a fault.
void run_once(Bytes input);

inline void require(bool holds, const char* what) {
  if (holds) return;
  std::fprintf(stderr, "%s\n", what);
  std::abort();
}

/// Takes an input apart from its front. What is used up is empty or 0.
class Input {
 public:
  explicit Input(Bytes bytes) : rest_(bytes) {}
  [[nodiscard]] Bytes take(std::size_t count) {
    const Bytes taken = rest_.first(count < rest_.size() ? count : rest_.size());
    rest_ = rest_.subspan(taken.size());
    return taken;
  }
  [[nodiscard]] std::uint64_t number(std::size_t width) {
    std::uint64_t value = 0;
    for (const std::byte byte : take(width)) value = value << 8 | std::to_integer<std::uint64_t>(byte);
    return value;
  }
  [[nodiscard]] Bytes rest() { return take(rest_.size()); }
  [[nodiscard]] bool is_used_up() const { return rest_.empty(); }

 private:
  Bytes rest_;
};

inline std::string_view as_text(Bytes bytes) { return {reinterpret_cast<const char*>(bytes.data()), bytes.size()}; }

}  // namespace quorvel::fuzz
