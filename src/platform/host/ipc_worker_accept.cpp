#include <sys/eventfd.h>
#include <sys/socket.h>

#include <cerrno>
#include <new>

#include "platform/host/connection_limit.h"
#include "platform/host/ipc_listener.h"
#include "platform/host/ipc_worker.h"
#include "platform/host/monotonic_clock.h"

namespace quorvel::platform::host {

namespace {

// A connection that was quiet for this long may have to make room for a new one.
constexpr std::int64_t kEvictableMilliseconds = 1000;

}  // namespace

void IpcWorker::listen() noexcept {
  epoll_event event = {};
  event.events = EPOLLIN | EPOLLEXCLUSIVE;
  event.data.ptr = listener_;
  if (::epoll_ctl(epoll_.get(), EPOLL_CTL_ADD, listener_->descriptor(), &event) == 0) {
    listen_again_ = 0;
  } else {
    listen_again_ = monotonic_milliseconds() + kAcceptRestMilliseconds;
  }
}

// A listener that cannot be accepted from stays readable and would keep the worker awake, so it is put aside until a
// connection closes or some time has passed.
void IpcWorker::rest() noexcept {
  if (listen_again_ != 0) return;
  ::epoll_ctl(epoll_.get(), EPOLL_CTL_DEL, listener_->descriptor(), nullptr);
  listen_again_ = now_ + kAcceptRestMilliseconds;
}

void IpcWorker::accept_one() noexcept {
  IpcConnection* evicted = nullptr;
  if (listener_->connection_count() >= client_connection_limit()) {
    evicted = longest_idle();
    if (evicted == nullptr) return rest();
  }
  Descriptor socket(::accept4(listener_->descriptor(), nullptr, nullptr, SOCK_NONBLOCK | SOCK_CLOEXEC));
  if (socket) {
    if (evicted != nullptr) close(*evicted);
    if (!introduce(std::move(socket))) rest();
  } else if (is_exhaustion(errno)) {
    evicted = longest_idle();
    rest();
    if (evicted != nullptr) close(*evicted);
  } else if (errno != EAGAIN && errno != EINTR && errno != ECONNABORTED) {
    rest();
  }
}

// False when memory runs out.
bool IpcWorker::introduce(Descriptor socket) noexcept {
  auto* connection = new (std::nothrow) IpcConnection(std::move(socket));
  if (connection == nullptr) return false;
  if (!listener_->accepts(*connection)) {
    delete connection;
    return true;
  }
  IpcWorker& least_loaded = listener_->least_loaded();
  // The kernel wakes the same thread again and again while that has time to accept, so the balance is struck here.
  if (connection_count() > least_loaded.connection_count()) {
    least_loaded.hand_over(*connection);
  } else {
    count_.fetch_add(1, std::memory_order_relaxed);
    take_in(*connection);
  }
  return true;
}

// The least recently used connection that nothing is in flight on, or null when none has been quiet long enough.
IpcConnection* IpcWorker::longest_idle() const noexcept {
  IpcConnection* first = list_of(Stage::idle).front();
  return first != nullptr && first->since + kEvictableMilliseconds <= now_ ? first : nullptr;
}

// Called by the worker that accepted the connection.
void IpcWorker::hand_over(IpcConnection& connection) noexcept {
  count_.fetch_add(1, std::memory_order_relaxed);
  {
    const LockHold hold(lock_);
    handed_over_.push_back(&connection);
  }
  ::eventfd_write(wake_.get(), 1);
}

void IpcWorker::take_in(IpcConnection& connection) noexcept {
  epoll_event event = {};
  event.events = EPOLLIN;
  event.data.ptr = &connection;
  connection.interest = EPOLLIN;
  move_to(connection, Stage::idle);
  if (::epoll_ctl(epoll_.get(), EPOLL_CTL_ADD, connection.descriptor(), &event) != 0) close(connection);
}

void IpcWorker::take_in_handed_over() noexcept {
  ConnectionList arrived;
  {
    const LockHold hold(lock_);
    arrived.take_all(handed_over_);
  }
  while (IpcConnection* connection = arrived.front()) take_in(*connection);
}

}  // namespace quorvel::platform::host
