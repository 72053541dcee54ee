// One thread of the IPC service: an event queue, the connections that belong to it, and the calls on them. Every worker
// accepts (ipc_acceptor.h); what its connections wait for, and for how long, is written down in ipc_stages.h.
#pragma once

#include <pthread.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <span>

#include "linux/base/event_queue.h"
#include "linux/base/intrusive_list.h"
#include "linux/ipc/ipc_acceptor.h"
#include "linux/ipc/ipc_connection.h"
#include "linux/ipc/ipc_stages.h"
#include "platform/lock.h"

namespace quorvel::platform {
class IpcListener;
}

namespace quorvel::platform::host {

class IpcWorker {
 public:
  IpcWorker() noexcept : acceptor_(*this) {}
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

  /// Has the worker close connections of the user who holds most, if there is still too much. Any thread.
  void ask_for_room() noexcept;
  /// Gives a new connection to this worker. Any thread.
  void hand_over(IpcConnection& connection) noexcept;
  /// How many connections belong to this worker. Any thread.
  [[nodiscard]] std::size_t connection_count() const noexcept { return count_.load(std::memory_order_relaxed); }

  // For the acceptor, on the worker's thread.

  /// Keeps a new connection and reads from it at once. Returns whether its client is gone already.
  [[nodiscard]] bool take_in(IpcConnection& connection) noexcept;
  void close(IpcConnection& connection) noexcept;
  [[nodiscard]] const IpcStages& stages() const noexcept { return stages_; }
  /// When this batch of events began, in milliseconds of the monotonic clock.
  [[nodiscard]] std::int64_t now() const noexcept { return now_; }

 private:
  using Stage = IpcConnection::Stage;

  // The loop.
  static void* run_thread(void* worker) noexcept;
  void run() noexcept;
  void finish() noexcept;
  [[nodiscard]] bool has_calls_under_way() const noexcept;
  [[nodiscard]] int wait_limit() const noexcept;
  [[nodiscard]] int wait_for_events(std::span<epoll_event> events) noexcept;
  void handle(const epoll_event& event) noexcept;
  void take_in_handed_over() noexcept;

  // One connection.
  void serve(IpcConnection& connection) noexcept;
  void receive(IpcConnection& connection) noexcept;
  [[nodiscard]] wire::FrameResult find_call(IpcConnection& connection) noexcept;
  void run_call(IpcConnection& connection) noexcept;
  void settle(IpcConnection& connection) noexcept;
  void go_on_sending(IpcConnection& connection) noexcept;
  void set_interest(IpcConnection& connection, std::uint32_t events) noexcept;
  void note_held_input(IpcConnection& connection) noexcept;

  // All of them.
  void serve_ready() noexcept;
  void bound_held_input() noexcept;
  void close_overdue() noexcept;
  void free_closed() noexcept;

  static constexpr std::size_t kReceiveRoom = 16u << 10;

  IpcListener* listener_ = nullptr;
  EventQueue queue_;
  pthread_t thread_ = {};
  bool started_ = false;
  std::atomic<bool> stopping_ = false;
  std::atomic<bool> must_make_room_ = false;
  std::atomic<std::size_t> count_ = 0;

  // The thread's own.
  bool expects_call_ = false;  // soon, from a client that called more than once
  std::int64_t now_ = 0;
  IpcStages stages_;
  IpcAcceptor acceptor_;
  IpcOutgoing outgoing_;
  std::byte room_[kReceiveRoom];

  Lock lock_;
  IntrusiveList<IpcConnection> handed_over_ QUORVEL_GUARDED_BY(lock_);
};

}  // namespace quorvel::platform::host
