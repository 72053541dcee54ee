// How a worker lets connections in: accepts whoever comes, has the delegate look at them, gives them to the worker with
// the fewest, and makes room. On the worker's thread only.
#pragma once

#include <cstdint>

#include "linux/base/event_queue.h"
#include "linux/base/resting_listener.h"
#include "linux/ipc/ipc_connection.h"

namespace quorvel::platform {
class IpcListener;
}

namespace quorvel::platform::host {

class IpcWorker;

class IpcAcceptor {
 public:
  explicit IpcAcceptor(IpcWorker& worker) noexcept : worker_(worker) {}

  /// Accepts from `listener` whenever somebody comes, of which `queue` tells.
  void open(IpcListener& listener, const EventQueue& queue) noexcept;
  /// Lets nobody in any more.
  void close() noexcept { socket_.close(); }

  [[nodiscard]] bool is_event(const epoll_event& event) const noexcept { return socket_.is_event(event); }
  /// Lets in those who wait, or some of them: the event comes again for the others.
  void accept_some() noexcept;

  /// Closes a connection of the worker's when there are more than there may be, or has other workers do so.
  void make_room() noexcept;

  /// For the worker's loop: when a listener that rests is due, and the word that a connection was closed.
  [[nodiscard]] std::int64_t due() const noexcept { return socket_.due(); }
  void wake_when_due(std::int64_t now) noexcept { socket_.wake_when_due(now); }
  void end_rest() noexcept { socket_.end_rest(); }

 private:
  [[nodiscard]] bool accept_one() noexcept;
  [[nodiscard]] bool introduce(Descriptor socket) noexcept;
  [[nodiscard]] bool has_place_for_one_more() noexcept;
  [[nodiscard]] IpcConnection* first_to_give_way() noexcept;

  IpcWorker& worker_;
  IpcListener* listener_ = nullptr;
  RestingListener socket_;
};

}  // namespace quorvel::platform::host
