#pragma once

#include <cstdint>
#include <ctime>

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

}  // namespace quorvel::platform::host
