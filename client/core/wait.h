// Time, and the wait before the next step of something that never blocks.
#pragma once

#include <cstdint>
#include <ctime>

namespace quorvel::client {

/// A moment of the monotonic clock, in nanoseconds.
using Moment = std::int64_t;
inline constexpr Moment kNever = INT64_MAX;

[[nodiscard]] inline Moment moment_now() noexcept {
  timespec now{};
  ::clock_gettime(CLOCK_MONOTONIC, &now);
  return now.tv_sec * INT64_C(1'000'000'000) + now.tv_nsec;
}

/// The moment `milliseconds` from now; never for a negative number.
[[nodiscard]] inline Moment moment_after(std::int64_t milliseconds) noexcept {
  constexpr std::int64_t a_millisecond = 1'000'000;
  const Moment now = moment_now();
  return milliseconds < 0 || milliseconds >= (kNever - now) / a_millisecond ? kNever
                                                                            : now + milliseconds * a_millisecond;
}

/// When the next step is due: once `descriptor` is ready for `events`, or at the moment `until`, whichever is first.
struct Wait {
  int descriptor = -1;  // none when negative
  short events = 0;     // of poll(2)
  Moment until = kNever;
};

/// Sleeps until the next step is due, but no longer than `deadline`. A signal may end the sleep early.
void sleep_until_due(const Wait& wait, Moment deadline = kNever) noexcept;

}  // namespace quorvel::client
