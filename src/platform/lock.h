// Locks that clang's thread-safety analysis can follow. The lock map stands in docs/architecture.md:
//
//   store lock          one per data ark; may take the notification center's lock and the log lock
//   large-load lock     loads of property-list files above 64 MiB; may take the log lock
//   notification lock   the notification center's ring; takes nothing
//   IPC locks           the host layer's own; take nothing, never held while a request runs
//   log lock            innermost: nothing is taken while it is held
#pragma once

#include <mutex>

#if defined(__clang__)
#define QUORVEL_THREAD_ANNOTATION(x) __attribute__((x))
#else
#define QUORVEL_THREAD_ANNOTATION(x)
#endif

#define QUORVEL_GUARDED_BY(x) QUORVEL_THREAD_ANNOTATION(guarded_by(x))
#define QUORVEL_REQUIRES(...) QUORVEL_THREAD_ANNOTATION(requires_capability(__VA_ARGS__))

namespace quorvel {

/// A non-recursive mutual-exclusion lock, ready without a set-up call.
class QUORVEL_THREAD_ANNOTATION(capability("mutex")) Lock {
 public:
  constexpr Lock() noexcept = default;
  Lock(const Lock&) = delete;
  Lock& operator=(const Lock&) = delete;
  void acquire() noexcept QUORVEL_THREAD_ANNOTATION(acquire_capability()) { mutex_.lock(); }
  void release() noexcept QUORVEL_THREAD_ANNOTATION(release_capability()) { mutex_.unlock(); }

 private:
  std::mutex mutex_;
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
