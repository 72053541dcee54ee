#include "linux/base/thread.h"

#include <cstddef>
#include <ctime>

#include "linux/base/monotonic_clock.h"

namespace quorvel::platform::host {

namespace {

// The default depends on the shell that the daemon was started from. Values are walked by
// recursion, to 512 levels at most.
constexpr std::size_t kStackSize = 1u << 20;

constexpr std::int64_t kPatienceMilliseconds = 500;

std::int64_t end_of_the_process = 0;  // 0 while nothing has told it to end

}  // namespace

void begin_to_end() noexcept { end_of_the_process = monotonic_milliseconds() + kPatienceMilliseconds; }

std::int64_t end_of_patience() noexcept {
  return end_of_the_process != 0 ? end_of_the_process : monotonic_milliseconds() + kPatienceMilliseconds;
}

// Asked again and again: the calls that wait until a given time go by a clock that may be set meanwhile, or are not
// known to the thread sanitizer.
bool join_thread(pthread_t thread, std::int64_t deadline) noexcept {
  constexpr timespec kPause = {0, 1'000'000};
  while (::pthread_tryjoin_np(thread, nullptr) != 0) {
    if (monotonic_milliseconds() >= deadline) return false;
    ::nanosleep(&kPause, nullptr);
  }
  return true;
}

int start_thread(pthread_t& thread, void* (*run)(void*), void* argument) noexcept {
  pthread_attr_t attributes;
  int error = ::pthread_attr_init(&attributes);
  if (error != 0) return error;
  ::pthread_attr_setstacksize(&attributes, kStackSize);
  error = ::pthread_create(&thread, &attributes, run, argument);
  ::pthread_attr_destroy(&attributes);
  return error;
}

}  // namespace quorvel::platform::host
