#include "linux/base/attached_descriptors.h"

#include <fcntl.h>
#include <pthread.h>
#include <sys/socket.h>
#include <sys/uio.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <csignal>
#include <ctime>
#include <tuple>
#include <utility>

#include "linux/base/error_line.h"
#include "linux/base/thread.h"

namespace quorvel::platform::host {

namespace {

// SO_PASSRIGHTS, which the C library's headers do not know yet.
constexpr int kPassRights = 83;

// The kernel waits for a lingering socket until a signal is there. This one is ignored unless somebody handles it, so
// that no other program can do harm with it.
constexpr int kHurry = SIGURG;
constexpr long kHurryNanoseconds = 200'000;

// The timer is set once for so many: setting it takes longer than closing most connections.
constexpr std::size_t kClosingsAtOnce = 64;

// A thread that closes what others give to it, through a pipe: as many as a pipe takes can wait without memory of ours.
class ClosingThread {
 public:
  [[nodiscard]] bool start() noexcept;
  [[nodiscard]] bool is_running() const noexcept { return running_.load(std::memory_order_acquire); }
  void close(Descriptor connection) noexcept;
  [[nodiscard]] std::size_t waiting() const noexcept { return waiting_.load(std::memory_order_relaxed); }

 private:
  static void* run_thread(void* thread) noexcept;
  [[noreturn]] void run() noexcept;
  [[nodiscard]] bool make_timer() noexcept;
  void hurry(long nanoseconds) const noexcept;

  int in_ = -1;  // the pipe's ends, which stay open until the process ends
  int out_ = -1;
  timer_t timer_ = {};
  std::atomic<std::size_t> waiting_ = 0;
  std::atomic<bool> running_ = false;
};

constinit ClosingThread closing_thread;

bool ClosingThread::start() noexcept {
  int ends[2];
  if (out_ < 0 && ::pipe2(ends, O_CLOEXEC) != 0) return false;
  if (out_ < 0) std::tie(out_, in_) = std::pair(ends[0], ends[1]);
  struct sigaction action = {};
  action.sa_handler = [](int) {};
  pthread_t thread;
  if (::fcntl(in_, F_SETFL, O_NONBLOCK) != 0 || ::sigaction(kHurry, &action, nullptr) != 0) return false;
  errno = start_thread(thread, run_thread, this);
  if (errno != 0) return false;
  ::pthread_detach(thread);
  running_.store(true, std::memory_order_release);
  return true;
}

void* ClosingThread::run_thread(void* thread) noexcept {
  name_this_thread("closing");
  static_cast<ClosingThread*>(thread)->run();
}

// Without a timer the closing takes the time that a peer wishes, but nobody else waits for it.
bool ClosingThread::make_timer() noexcept {
  sigset_t others;
  sigfillset(&others);
  sigdelset(&others, kHurry);
  ::pthread_sigmask(SIG_SETMASK, &others, nullptr);
  sigevent to_this_thread = {};
  to_this_thread.sigev_notify = SIGEV_THREAD_ID;
  to_this_thread.sigev_signo = kHurry;
  to_this_thread._sigev_un._tid = ::gettid();
  return ::timer_create(CLOCK_MONOTONIC, &to_this_thread, &timer_) == 0;
}

// The signal comes again and again until the closing is done: one that comes before the waiting begins ends nothing.
void ClosingThread::hurry(long nanoseconds) const noexcept {
  const itimerspec often = {{0, nanoseconds}, {0, nanoseconds}};
  ::timer_settime(timer_, 0, &often, nullptr);
}

void ClosingThread::run() noexcept {
  const bool has_timer = make_timer();
  for (;;) {
    int descriptors[kClosingsAtOnce];
    const ssize_t size = ::read(out_, descriptors, sizeof descriptors);
    if (size <= 0) continue;
    if (has_timer) hurry(kHurryNanoseconds);
    for (const int descriptor : std::span(descriptors, static_cast<std::size_t>(size) / sizeof *descriptors)) {
      ::close(descriptor);
      waiting_.fetch_sub(1, std::memory_order_relaxed);
    }
    if (has_timer) hurry(0);
  }
}

void ClosingThread::close(Descriptor connection) noexcept {
  const int descriptor = connection.get();
  waiting_.fetch_add(1, std::memory_order_relaxed);
  if (::write(in_, &descriptor, sizeof descriptor) == sizeof descriptor) {
    static_cast<void>(connection.take());
  } else {
    waiting_.fetch_sub(1, std::memory_order_relaxed);
  }
}

[[nodiscard]] bool refuse(int socket) noexcept {
  constexpr int kNone = 0;
  return ::setsockopt(socket, SOL_SOCKET, kPassRights, &kNone, sizeof kNone) == 0;
}

void keep_away() noexcept {
  if (closing_thread.is_running() || closing_thread.start()) return;
  print_system_error("cannot start the thread that closes what peers attach to their messages");
}

[[nodiscard]] bool has_attached_descriptors(const msghdr& message) noexcept {
  return (message.msg_flags & MSG_CTRUNC) != 0;
}

}  // namespace

void refuse_attached_descriptors(int listener) noexcept {
  const int error = errno;
  if (!refuse(listener)) keep_away();
  errno = error;
}

void refuse_further_descriptors(int listener) noexcept {
  const int error = errno;
  static_cast<void>(refuse(listener));
  keep_away();
  errno = error;
}

// A connection that is older than the refusal on its listener knows nothing of it. A byte that is out of band would be
// dropped, with what is attached to it, when the bytes around it are received.
void prepare_to_receive(int connection) noexcept {
  if (!closing_thread.is_running()) return;
  static_cast<void>(refuse(connection));
  constexpr int kYes = 1;
  static_cast<void>(::setsockopt(connection, SOL_SOCKET, SO_OOBINLINE, &kYes, sizeof kYes));
}

// Looking at bytes (MSG_PEEK) leaves them where they are, with whatever is attached to them. Of attached descriptors
// the kernel says that there was no room to pass them on. A look ends behind the first message that has any, so the
// bytes of a look without any are free of them, and no more than those are received.
ssize_t receive_bytes(int connection, std::span<std::byte> room) noexcept {
  if (closing_thread.is_running()) {
    iovec part = {room.data(), room.size()};
    msghdr message = {};
    message.msg_iov = &part;
    message.msg_iovlen = 1;
    const ssize_t count = ::recvmsg(connection, &message, MSG_PEEK | MSG_DONTWAIT);
    if (count <= 0) return count;
    if (has_attached_descriptors(message)) {
      errno = EPERM;
      return -1;
    }
    room = room.first(static_cast<std::size_t>(count));
  }
  return ::recv(connection, room.data(), room.size(), MSG_DONTWAIT);
}

void close_connection(Descriptor connection) noexcept {
  if (connection && closing_thread.is_running()) closing_thread.close(std::move(connection));
}

std::size_t closing_connections() noexcept { return closing_thread.waiting(); }

}  // namespace quorvel::platform::host
