#include <sys/eventfd.h>
#include <sys/socket.h>

#include <cerrno>
#include <new>
#include <utility>

#include "linux/base/connection_limit.h"
#include "linux/base/monotonic_clock.h"
#include "linux/ipc/ipc_listener.h"
#include "linux/ipc/ipc_worker.h"

namespace quorvel::platform::host {

namespace {

// A connection that was quiet for this long may have to make room for a new one; one that never made a call, sooner.
constexpr std::int64_t kEvictableMilliseconds = 1000;
constexpr std::int64_t kUnusedMilliseconds = 100;

constexpr int kAcceptsAtOnce = 16;

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

// Who connects only to leave again is often not alone: the next one is looked for without waiting for an event.
void IpcWorker::accept_some() noexcept {
  for (int i = 0; i < kAcceptsAtOnce && accept_one(); ++i) continue;
}

// Returns whether somebody came and is gone already.
bool IpcWorker::accept_one() noexcept {
  IpcConnection* evicted = nullptr;
  if (listener_->connection_count() >= client_connection_limit()) {
    evicted = longest_idle();
    if (evicted == nullptr) {
      rest();
      return false;
    }
  }
  Descriptor socket(::accept4(listener_->descriptor(), nullptr, nullptr, SOCK_NONBLOCK | SOCK_CLOEXEC));
  if (socket) {
    if (evicted != nullptr) close(*evicted);
    return introduce(std::move(socket));
  } else if (is_exhaustion(errno)) {
    evicted = longest_idle();
    rest();
    if (evicted != nullptr) close(*evicted);
  } else if (errno != EAGAIN && errno != EINTR && errno != ECONNABORTED) {
    rest();
  }
  return false;
}

// Returns whether the client is gone already.
bool IpcWorker::introduce(Descriptor socket) noexcept {
  auto* connection = new (std::nothrow) IpcConnection(std::move(socket));
  if (connection == nullptr) {
    rest();
    return false;
  }
  if (!listener_->accepts(*connection)) {
    delete connection;
    return true;
  }
  IpcWorker& least_loaded = listener_->least_loaded();
  // The kernel wakes the same thread again and again while that has time to accept, so the balance is struck here.
  if (connection_count() > least_loaded.connection_count()) {
    least_loaded.hand_over(*connection);
    return false;
  }
  count_.fetch_add(1, std::memory_order_relaxed);
  move_to(*connection, Stage::fresh);
  // Who sends a call and leaves, or sends what is none, costs no more than that.
  receive(*connection);
  if (connection->interest == 0 && connection->stage != Stage::closed) set_interest(*connection, EPOLLIN);
  return connection->stage == Stage::closed;
}

// The least recently used connection that nothing is in flight on, one without a call first, or null when none has been
// quiet long enough.
IpcConnection* IpcWorker::longest_idle() const noexcept {
  for (const auto& [stage, limit] :
       {std::pair(Stage::fresh, kUnusedMilliseconds), std::pair(Stage::idle, kEvictableMilliseconds)}) {
    IpcConnection* first = list_of(stage).front();
    if (first != nullptr && first->since + limit <= now_) return first;
  }
  return nullptr;
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
  move_to(connection, connection.stage);
  set_interest(connection, EPOLLIN);
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
