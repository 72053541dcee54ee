// One thread of the IPC service: an event queue, the connections that belong to it, and their deadlines. Every worker
// accepts; a new connection goes to the worker with the fewest.
#pragma once

#include <pthread.h>
#include <sys/epoll.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <span>

#include "linux/base/intrusive_list.h"
#include "linux/ipc/ipc_connection.h"
#include "platform/descriptor.h"
#include "platform/lock.h"

namespace quorvel::platform {
class IpcListener;
}

namespace quorvel::platform::host {

class IpcWorker {
 public:
  IpcWorker() noexcept = default;
  IpcWorker(const IpcWorker&) = delete;
  IpcWorker& operator=(const IpcWorker&) = delete;
  /// All connections are closed; the thread must have been stopped.
  ~IpcWorker();

  /// Makes what other workers may use of this one; all are prepared before the first starts. Main thread, as the three
  /// below. False with errno set.
  [[nodiscard]] bool prepare(IpcListener& listener) noexcept;
  /// Starts the thread. False with errno set.
  [[nodiscard]] bool start() noexcept;
  /// Tells the thread to end: it lets nobody in any more, and has a tenth of a second for the calls that are under way.
  void begin_to_stop() noexcept;
  /// Waits for the end of the thread, which was told to end. False when it has not ended by `deadline`: the worker and
  /// its listener must then be left to it.
  [[nodiscard]] bool wait_for_end(std::int64_t deadline) noexcept;

  /// Has the worker close a connection of the user who holds most, if there are still too many. Any thread.
  void ask_for_room() noexcept;

  /// How many connections belong to this worker. Any thread.
  [[nodiscard]] std::size_t connection_count() const noexcept { return count_.load(std::memory_order_relaxed); }

 private:
  using Stage = IpcConnection::Stage;
  using ConnectionList = IntrusiveList<IpcConnection>;

  static void* run_thread(void* worker) noexcept;
  void run() noexcept;
  void finish() noexcept;
  [[nodiscard]] bool has_calls_under_way() const noexcept;
  [[nodiscard]] int wait_for_events(std::span<epoll_event> events) noexcept;
  void handle(const epoll_event& event) noexcept;
  [[nodiscard]] int wait_limit() const noexcept;

  // Serving: ipc_worker.cpp.
  void serve(IpcConnection& connection) noexcept;
  void receive(IpcConnection& connection) noexcept;
  void take_turn(IpcConnection& connection, std::span<const std::byte> bytes) noexcept;
  void settle(IpcConnection& connection) noexcept;
  void bound_held_input() noexcept;
  void finish_reply(IpcConnection& connection) noexcept;
  void serve_ready() noexcept;
  void move_to(IpcConnection& connection, Stage stage) noexcept;
  void set_interest(IpcConnection& connection, std::uint32_t events) noexcept;
  void close(IpcConnection& connection) noexcept;
  void close_overdue() noexcept;
  void close_all() noexcept;
  void free_closed() noexcept;
  [[nodiscard]] ConnectionList& list_of(Stage stage) noexcept { return lists_[static_cast<std::size_t>(stage)]; }
  [[nodiscard]] const ConnectionList& list_of(Stage stage) const noexcept {
    return lists_[static_cast<std::size_t>(stage)];
  }

  // Accepting: ipc_worker_accept.cpp.
  void listen() noexcept;
  void rest() noexcept;
  void accept_some() noexcept;
  [[nodiscard]] bool accept_one() noexcept;
  [[nodiscard]] bool introduce(Descriptor socket) noexcept;
  [[nodiscard]] bool has_place_for_one_more() noexcept;
  void make_room() noexcept;
  [[nodiscard]] IpcConnection* first_to_give_way() noexcept;
  void hand_over(IpcConnection& connection) noexcept;
  void take_in(IpcConnection& connection) noexcept;
  void take_in_handed_over() noexcept;

  static constexpr std::size_t kReceiveRoom = 16u << 10;

  IpcListener* listener_ = nullptr;
  Descriptor epoll_;
  Descriptor wake_;
  pthread_t thread_ = {};
  bool started_ = false;
  std::atomic<bool> stopping_ = false;
  std::atomic<bool> must_make_room_ = false;
  std::atomic<std::size_t> count_ = 0;

  // The thread's own.
  bool expects_call_ = false;  // soon, from a client that called more than once
  std::int64_t now_ = 0;
  std::int64_t listen_again_ = 0;  // when a resting listener is listened to again; 0 while it is listened to
  ConnectionList lists_[static_cast<std::size_t>(Stage::closed) + 1];
  IpcOutgoing outgoing_;
  std::byte room_[kReceiveRoom];

  Lock lock_;
  ConnectionList handed_over_ QUORVEL_GUARDED_BY(lock_);
};

}  // namespace quorvel::platform::host
