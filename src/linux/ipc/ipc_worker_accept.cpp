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

// A connection without a call is given this long for its first one before it gives way to others.
constexpr std::int64_t kUnusedMilliseconds = 100;

// A user with more connections than this gets less room in the kernel for unread replies on the others: no program
// needs so many, and each could leave a reply unread. The kernel doubles the number.
constexpr std::size_t kOrdinaryConnections = 16;
constexpr int kSmallSendRoom = 4096;

constexpr int kAcceptsAtOnce = 16;

constexpr std::size_t kAboveLimit = 4;

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

// A client that connects only to leave again is often not alone: the next one is looked for without waiting for an
// event.
void IpcWorker::accept_some() noexcept {
  for (int i = 0; i < kAcceptsAtOnce && accept_one(); ++i) continue;
}

// Returns whether somebody came and is gone already. Everybody is let in, because only then it shows who they are; room
// is made afterwards.
bool IpcWorker::accept_one() noexcept {
  if (!has_place_for_one_more()) {
    rest();
    return false;
  }
  Descriptor socket(::accept4(listener_->descriptor(), nullptr, nullptr, SOCK_NONBLOCK | SOCK_CLOEXEC));
  if (socket) {
    const bool is_gone = introduce(std::move(socket));
    make_room();
    return is_gone;
  }
  if (is_exhaustion(errno)) {
    IpcConnection* first = first_to_give_way();
    rest();
    if (first != nullptr) close(*first);
  } else if (errno != EAGAIN && errno != EINTR && errno != ECONNABORTED) {
    rest();
  }
  return false;
}

// Returns whether the client is gone already.
bool IpcWorker::introduce(Descriptor socket) noexcept {
  auto* connection = new (std::nothrow) IpcConnection(std::move(socket));
  const std::size_t connections = connection != nullptr ? listener_->shares().add(connection->peer().user) : 0;
  if (connections == 0) {
    delete connection;
    rest();
    return false;
  }
  if (!listener_->accepts(*connection)) {
    listener_->shares().remove(connection->peer().user);
    delete connection;
    return true;
  }
  if (connections > kOrdinaryConnections) {
    ::setsockopt(connection->descriptor(), SOL_SOCKET, SO_SNDBUF, &kSmallSendRoom, sizeof kSmallSendRoom);
  }
  IpcWorker& least_loaded = listener_->least_loaded();
  // The kernel wakes the same thread again and again while that has time to accept, so the balance is struck here.
  if (connection_count() > least_loaded.connection_count()) {
    least_loaded.hand_over(*connection);
    return false;
  }
  count_.fetch_add(1, std::memory_order_relaxed);
  move_to(*connection, Stage::fresh);
  // A client that sends a call and leaves, or sends something that is no call, costs no more than that.
  receive(*connection);
  if (connection->interest == 0 && connection->stage != Stage::closed) set_interest(*connection, EPOLLIN);
  return connection->stage == Stage::closed;
}

void IpcWorker::ask_for_room() noexcept {
  must_make_room_.store(true);
  ::eventfd_write(wake_.get(), 1);
}

// Between a newcomer and the connection that gives way for it there are more than there may be, which the reserve of
// descriptors bears for a few. Beyond them this worker waits for what others, whom it has asked, let go of.
bool IpcWorker::has_place_for_one_more() noexcept {
  const std::size_t most = client_connection_limit() + kAboveLimit;
  if (listener_->connection_count() >= most) make_room();
  return listener_->connection_count() < most;
}

// Closes a connection when there are more than there may be.
void IpcWorker::make_room() noexcept {
  if (listener_->connection_count() <= client_connection_limit()) return;
  if (IpcConnection* first = first_to_give_way()) {
    close(*first);
  } else {
    listener_->ask_others_for_room(*this);
  }
}

// Of the user who holds most connections, the one that is missed least: one that has been there for a while without a
// call, then the one that has been idle longest, then one in the middle of a call or a reply, and one that has just
// come last. Null when this worker has none of that user.
IpcConnection* IpcWorker::first_to_give_way() noexcept {
  const uid_t heaviest = listener_->shares().heaviest();
  const auto oldest = [&](Stage stage, std::int64_t since) -> IpcConnection* {
    ConnectionList& list = list_of(stage);
    for (IpcConnection* connection = list.front(); connection != nullptr; connection = list.after(connection)) {
      if (connection->peer().user == heaviest) return connection->since <= since ? connection : nullptr;
    }
    return nullptr;
  };
  if (IpcConnection* unused = oldest(Stage::fresh, now_ - kUnusedMilliseconds)) return unused;
  for (const Stage stage : {Stage::idle, Stage::partial, Stage::sending, Stage::fresh}) {
    if (IpcConnection* connection = oldest(stage, now_)) return connection;
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
