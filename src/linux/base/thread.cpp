#include "linux/base/thread.h"

#include <cstddef>

namespace quorvel::platform::host {

namespace {

// The default depends on the shell that the daemon was started from. Nothing in the daemon recurses on input.
constexpr std::size_t kStackSize = 1u << 20;

constexpr long kPatienceNanoseconds = 500'000'000;

}  // namespace

timespec end_of_patience() noexcept {
  timespec now = {};
  ::clock_gettime(CLOCK_MONOTONIC, &now);
  const long nanoseconds = now.tv_nsec + kPatienceNanoseconds;
  return {now.tv_sec + nanoseconds / 1'000'000'000, nanoseconds % 1'000'000'000};
}

bool join_thread(pthread_t thread, const timespec& deadline) noexcept {
  return ::pthread_clockjoin_np(thread, nullptr, CLOCK_MONOTONIC, &deadline) == 0;
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
