#include "platform/lock.h"

namespace quorvel {

namespace {

void pause() noexcept {
#if defined(__x86_64__) || defined(__i386__)
  __builtin_ia32_pause();
#elif defined(__aarch64__)
  asm volatile("isb");
#endif
}

}  // namespace

void Lock::wait() noexcept {
  for (int pauses = kFirstPauses; pauses <= kLastPauses; pauses *= 2) {
    for (int i = 0; i < pauses; ++i) pause();
    if (state_.load(std::memory_order_relaxed) == kFree && take_free()) return;
  }
  // Taken as awaited: whether others sleep as well is not known.
  while (state_.exchange(kAwaited, std::memory_order_acquire) != kFree) {
    state_.wait(kAwaited, std::memory_order_relaxed);
  }
}

}  // namespace quorvel
