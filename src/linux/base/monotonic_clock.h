#pragma once

#include <algorithm>
#include <cstdint>
#include <ctime>
#include <limits>

namespace quorvel::platform::host {

/// Milliseconds on a clock that nobody sets, a few milliseconds exact, read without a system call.
[[nodiscard]] inline std::int64_t monotonic_milliseconds() noexcept {
  timespec now;
  ::clock_gettime(CLOCK_MONOTONIC_COARSE, &now);
  return std::int64_t{now.tv_sec} * 1000 + now.tv_nsec / 1'000'000;
}

/// Microseconds on the same clock, exact.
[[nodiscard]] inline std::int64_t monotonic_microseconds() noexcept {
  timespec now;
  ::clock_gettime(CLOCK_MONOTONIC, &now);
  return std::int64_t{now.tv_sec} * 1'000'000 + now.tv_nsec / 1'000;
}

/// How long a wait that ends at `due` on that clock may last, in milliseconds: at least 1, as the clock may be that
/// much behind, and half a minute at most; -1, for ever, when `due` is the largest number.
[[nodiscard]] inline int milliseconds_until(std::int64_t due) noexcept {
  if (due == std::numeric_limits<std::int64_t>::max()) return -1;
  return static_cast<int>(std::clamp<std::int64_t>(due - monotonic_milliseconds(), 1, 30'000));
}

}  // namespace quorvel::platform::host
