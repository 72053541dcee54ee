#include "linux/base/thread.h"

#include <cstddef>

namespace quorvel::platform::host {

namespace {

// The default depends on the shell that the daemon was started from. Nothing in the daemon recurses on input.
constexpr std::size_t kStackSize = 1u << 20;

}  // namespace

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
