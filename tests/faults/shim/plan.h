// What the harness and the preloaded library agree on: a file that both map. The harness fills it in, arms it while the
// daemon runs or before it starts, and reads afterwards what was done.
#pragma once

#include <atomic>
#include <cerrno>
#include <cstddef>
#include <cstdint>

namespace quorvel::faults {

inline constexpr const char* kPlanVariable = "QUORVEL_FAULT_PLAN";

/// Stands among the errors for a transfer that moves half of its bytes.
inline constexpr int kShortTransfer = -1;

// The counted calls, each with the errors that it can give where the daemon makes it. The library passes on the first
// ones as they are, the others have something of their own.
#define QUORVEL_PLAIN_CALLS(CALL)                                         \
  CALL(accept4, EINTR, ECONNABORTED, EMFILE, ENFILE, ENOMEM, ENOBUFS)     \
  CALL(bind, EADDRINUSE, EACCES, ENOMEM, ENOSPC, EROFS)                   \
  CALL(close, EIO, EINTR, ENOSPC)                                         \
  CALL(connect, ECONNREFUSED, EACCES, EAGAIN, ENOMEM, EINTR)              \
  CALL(epoll_create1, EMFILE, ENFILE, ENOMEM)                             \
  CALL(epoll_wait, EINTR)                                                 \
  CALL(eventfd, EMFILE, ENFILE, ENOMEM)                                   \
  CALL(eventfd_read, EAGAIN)                                              \
  CALL(fchmod, EIO, EPERM, EROFS, ENOMEM)                                 \
  CALL(fchmodat, EIO, EPERM, EROFS, ENOMEM)                               \
  CALL(fcntl, EPERM)                                                      \
  CALL(fdatasync, EIO, ENOSPC, EDQUOT, EINTR)                             \
  CALL(flock, ENOLCK, EWOULDBLOCK, EINTR)                                 \
  CALL(fstat, EIO, ENOMEM)                                                \
  CALL(fstatat, EIO, EACCES, ENOMEM)                                      \
  CALL(ftruncate, EIO, EPERM, EINTR)                                      \
  CALL(getsockopt, EACCES)                                                \
  CALL(listen, EACCES)                                                    \
  CALL(mkdirat, EIO, EACCES, ENOSPC, EROFS, EMLINK, ENOMEM)               \
  CALL(open, EMFILE, ENFILE, ENOMEM)                                      \
  CALL(openat, EMFILE, ENFILE, ENOMEM, EACCES, EIO, ENOSPC, EROFS, EINTR) \
  CALL(readlink, EACCES, ENOENT, ENOMEM)                                  \
  CALL(renameat, EIO, EACCES, ENOSPC, EROFS, EDQUOT, ENOMEM)              \
  CALL(sendto, ECONNREFUSED, ENOENT, ENOBUFS, EAGAIN, EINTR)              \
  CALL(setrlimit, EPERM)                                                  \
  CALL(setsockopt, ENOMEM)                                                \
  CALL(signalfd, EMFILE, ENFILE, ENOMEM)                                  \
  CALL(socket, EMFILE, ENFILE, ENOMEM, ENOBUFS, EACCES)                   \
  CALL(stat, EIO, EACCES, ENOMEM)                                         \
  CALL(timerfd_create, EMFILE, ENFILE, ENOMEM)                            \
  CALL(unlinkat, EIO, EACCES, EBUSY, EROFS, ENOMEM)
#define QUORVEL_OTHER_CALLS(CALL)                                                  \
  CALL(epoll_add, ENOMEM, ENOSPC)                                                  \
  CALL(epoll_modify, ENOMEM)                                                       \
  CALL(openat2, EMFILE, ENFILE, ENOMEM, EACCES, EIO, EAGAIN, EINTR)                \
  CALL(pthread_create, EAGAIN)                                                     \
  CALL(read, EIO, ENOMEM, EINTR, kShortTransfer)                                   \
  CALL(recv, ECONNRESET, ENOMEM, EAGAIN, EINTR, kShortTransfer)                    \
  CALL(send, ECONNRESET, EPIPE, ENOMEM, ENOBUFS, EAGAIN, EINTR, kShortTransfer)    \
  CALL(sendmsg, ECONNRESET, EPIPE, ENOMEM, ENOBUFS, EAGAIN, EINTR, kShortTransfer) \
  CALL(write, EIO, ENOSPC, EDQUOT, EFBIG, EINTR, kShortTransfer)

#define QUORVEL_NAME_OF_CALL(name, ...) name,
enum class Call : std::uint8_t {
  QUORVEL_PLAIN_CALLS(QUORVEL_NAME_OF_CALL) QUORVEL_OTHER_CALLS(QUORVEL_NAME_OF_CALL) count
};

struct CallErrors {
  const char* name;
  int errors[9];  // ended by 0
};
#define QUORVEL_ERRORS_OF_CALL(name, ...) {#name, {__VA_ARGS__}},
/// In the order of Call.
inline constexpr CallErrors kCallErrors[] = {QUORVEL_PLAIN_CALLS(QUORVEL_ERRORS_OF_CALL)
                                                 QUORVEL_OTHER_CALLS(QUORVEL_ERRORS_OF_CALL)};

enum class Action : std::uint8_t { count_only, fail_once, fail_from_then_on, kill_before, kill_after };

struct Plan {
  static constexpr std::uint32_t kTraceSize = 4096;

  // Written by the harness before it arms the plan.
  Action action;
  std::uint32_t target;  // a kill: number of the call, the first being 1; a fault: number among the calls of its kind
  Call kind;
  int error;
  std::uint32_t flush_milliseconds;  // how long a flush takes at least
  std::atomic<bool> armed;

  // Written by the library.
  std::atomic<std::uint32_t> calls;  // counted while armed
  std::atomic<std::uint32_t> calls_of_kind;
  std::atomic<std::uint32_t> injected;      // failures, each of which has really happened
  std::atomic<bool> error_output_failed;    // the daemon's lines on standard error cannot be relied on
  std::atomic<std::uint32_t> save_begun;    // number of the call that opens the temporary file
  std::atomic<std::uint32_t> save_flushes;  // flushes since; the second one, the directory's, ends the save
  std::atomic<Call> trace[kTraceSize];      // the calls by number
};

}  // namespace quorvel::faults
