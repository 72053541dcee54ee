#include "linux/ipc/ipc_acceptor.h"

#include <cerrno>
#include <memory>
#include <new>
#include <utility>

#include "linux/base/connection_limit.h"
#include "linux/ipc/ipc_listener.h"
#include "linux/ipc/ipc_worker.h"

namespace quorvel::platform::host {

namespace {

constexpr int kAcceptsAtOnce = 16;

}  // namespace

// All workers accept, and the kernel wakes one of them.
void IpcAcceptor::open(IpcListener& listener, const EventQueue& queue) noexcept {
  listener_ = &listener;
  socket_.open(queue, listener.descriptor(), EPOLLIN | EPOLLEXCLUSIVE);
}

// A client that connects only to leave again is often not alone: the next one is looked for without waiting for an
// event.
void IpcAcceptor::accept_some() noexcept {
  for (int i = 0; i < kAcceptsAtOnce && accept_one(); ++i) continue;
}

// Returns whether somebody came and is gone already. Everybody is let in, because only then it shows who they are; room
// is made afterwards.
bool IpcAcceptor::accept_one() noexcept {
  if (!has_place_for_one_more()) {
    socket_.rest_briefly();
    return false;
  }
  if (Descriptor socket = socket_.accept()) {
    const bool is_gone = introduce(std::move(socket));
    make_room();
    return is_gone;
  }
  if (is_exhaustion(errno)) {
    if (IpcConnection* first = first_to_give_way()) worker_.close(*first);
  }
  return false;
}

// Returns whether the client is gone already.
bool IpcAcceptor::introduce(Descriptor socket) noexcept {
  std::unique_ptr<IpcConnection> connection(new (std::nothrow) IpcConnection(std::move(socket)));
  const std::size_t held = connection != nullptr ? listener_->places().take(connection->peer().user) : 0;
  if (held == 0) {
    socket_.rest();
    return false;
  }
  if (!listener_->accepts(*connection)) {
    listener_->places().give_back(connection->peer().user);
    return true;
  }
  listener_->places().bound_send_room(connection->descriptor(), held);
  IpcWorker& least_loaded = listener_->least_loaded();
  // The kernel wakes the same thread again and again while that has time to accept, so the balance is struck here.
  if (worker_.connection_count() > least_loaded.connection_count()) {
    least_loaded.hand_over(*connection.release());
    return false;
  }
  return worker_.take_in(*connection.release());
}

// Between a newcomer and the connection that gives way for it there are more than there may be. Beyond the few that can
// be borne this worker waits for what others, whom it has asked, let go of.
bool IpcAcceptor::has_place_for_one_more() noexcept {
  if (!listener_->places().bear_one_more()) make_room();
  return listener_->places().bear_one_more();
}

void IpcAcceptor::make_room() noexcept {
  if (!listener_->places().are_overfull()) return;
  if (IpcConnection* first = first_to_give_way()) {
    worker_.close(*first);
  } else {
    listener_->ask_others_for_room(worker_);
  }
}

// Null when this worker has no connection of the user who holds most.
IpcConnection* IpcAcceptor::first_to_give_way() noexcept {
  return worker_.stages().first_to_give_way(listener_->places().heaviest(), worker_.now());
}

}  // namespace quorvel::platform::host
