// Locks that clang's thread-safety analysis can follow. The lock map stands in docs/architecture.md:
//
//   store lock          one per data ark; may take the notification center's lock and the log lock
//   large-load lock     loads of property-list files above 64 MiB; may take the log lock
//   notification lock   the notification center's ring; takes nothing
//   IPC locks           hand-over, shares and waiting replies: take nothing, held for a moment
//   zone lock           the C library's time zone; takes nothing
//   telephony lock      the last state that the telephony service pushed; takes nothing
//   left-out-lines lock the lines that clients caused of late; takes nothing
//   log lock            innermost: nothing is taken while it is held
#pragma once

#include <atomic>

#if defined(__clang__)
#define QUORVEL_THREAD_ANNOTATION(x) __attribute__((x))
#else
#define QUORVEL_THREAD_ANNOTATION(x)
#endif

// The thread sanitizer watches the order of locks it is told of.
#if defined(__SANITIZE_THREAD__)
#include <sanitizer/tsan_interface.h>
#define QUORVEL_TELL_SANITIZER(call) call
#else
#define QUORVEL_TELL_SANITIZER(call) static_cast<void>(0)
#endif

#define QUORVEL_GUARDED_BY(x) QUORVEL_THREAD_ANNOTATION(guarded_by(x))
#define QUORVEL_REQUIRES(...) QUORVEL_THREAD_ANNOTATION(requires_capability(__VA_ARGS__))

namespace quorvel {

/// A non-recursive mutual-exclusion lock, ready without a set-up call.
///
/// What it guards is mostly held for less than it takes to sleep and wake up, or even to pass the lock from one
/// processor to another. So a thread that finds it taken stays away from it for some microseconds, looks again, a few
/// times at growing intervals, and then sleeps: threads that are after one lock get through many operations each before
/// they take turns.
class QUORVEL_THREAD_ANNOTATION(capability("mutex")) Lock {
 public:
  constexpr Lock() noexcept = default;
  Lock(const Lock&) = delete;
  Lock& operator=(const Lock&) = delete;
  void acquire() noexcept QUORVEL_THREAD_ANNOTATION(acquire_capability()) {
    QUORVEL_TELL_SANITIZER(__tsan_mutex_pre_lock(this, 0));
    if (!take_free()) wait();
    QUORVEL_TELL_SANITIZER(__tsan_mutex_post_lock(this, 0, 0));
  }
  void release() noexcept QUORVEL_THREAD_ANNOTATION(release_capability()) {
    QUORVEL_TELL_SANITIZER(__tsan_mutex_pre_unlock(this, 0));
    if (state_.exchange(kFree, std::memory_order_release) == kAwaited) state_.notify_one();
    QUORVEL_TELL_SANITIZER(__tsan_mutex_post_unlock(this, 0));
  }

 private:
  enum State : int { kFree, kTaken, kAwaited };
  static constexpr int kFirstPauses = 64, kLastPauses = 256;  // of about 40 ns each

  bool take_free() noexcept {
    int expected = kFree;
    return state_.compare_exchange_strong(expected, kTaken, std::memory_order_acquire, std::memory_order_relaxed);
  }
  void wait() noexcept;

  std::atomic<int> state_ = kFree;
};

/// Holds a lock for a scope.
class QUORVEL_THREAD_ANNOTATION(scoped_lockable) LockHold {
 public:
  explicit LockHold(Lock& lock) noexcept QUORVEL_THREAD_ANNOTATION(acquire_capability(lock)) : lock_(lock) {
    lock_.acquire();
  }
  ~LockHold() QUORVEL_THREAD_ANNOTATION(release_capability()) { lock_.release(); }
  LockHold(const LockHold&) = delete;
  LockHold& operator=(const LockHold&) = delete;

 private:
  Lock& lock_;
};

}  // namespace quorvel
