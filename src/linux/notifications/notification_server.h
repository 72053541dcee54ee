// The notification center's socket and thread. Whoever connects receives each notification from then on.
#pragma once

#include <pthread.h>

#include <atomic>
#include <cstdint>

#include "linux/base/connection_limit.h"
#include "linux/base/event_queue.h"
#include "linux/base/local_socket.h"
#include "linux/base/places.h"
#include "linux/base/resting_listener.h"
#include "linux/notifications/notification_observer.h"
#include "wire/notification_ring.h"

namespace quorvel::platform::host {

class NotificationServer {
 public:
  NotificationServer() noexcept = default;
  NotificationServer(const NotificationServer&) = delete;
  NotificationServer& operator=(const NotificationServer&) = delete;
  ~NotificationServer() { stop(); }

  /// Opens the socket and starts the thread. False with errno set. Main thread, as are the next two.
  [[nodiscard]] bool start() noexcept;
  /// Takes the socket away and tells the thread to end, after it has sent what observers can take at once.
  void begin_to_stop() noexcept;
  /// The same, and waits for the thread's end, but no longer than its process may take to end.
  void stop() noexcept;

  /// Passes an encoded notification on, or, where it is empty, that one could not be encoded. Never waits. Any thread.
  void post(ByteBuffer frame) noexcept;
  /// False when nobody can be connected. Any thread.
  [[nodiscard]] bool is_running() const noexcept { return running_.load(std::memory_order_acquire); }

 private:
  using Progress = NotificationObserver::Progress;

  static void* run_thread(void* server) noexcept;
  void run() noexcept;
  void handle(const epoll_event& event) noexcept;
  void serve_news() noexcept;
  void serve(NotificationObserver& observer) noexcept;
  void remove(NotificationObserver& observer) noexcept;
  void forget_served() noexcept;
  void accept_waiting() noexcept;
  [[nodiscard]] bool take_in(Descriptor socket) noexcept;
  void make_room() noexcept;

  ListeningSocket socket_;
  EventQueue queue_;
  pthread_t thread_ = {};
  bool started_ = false;
  std::atomic<bool> running_ = false;
  std::atomic<bool> stopping_ = false;
  std::atomic<bool> woken_ = false;  // a wake-up is on its way that will see everything posted so far
  wire::NotificationRing ring_;

  // The thread's own.
  IntrusiveList<NotificationObserver> observers_;
  Places places_{observer_connection_limit};
  std::uint64_t served_ = 0;  // what was newest when observers were last accepted
  RestingListener listener_;
};

/// The process's one server. Lives until the process ends.
[[nodiscard]] NotificationServer& notification_server() noexcept;

/// Starts it, or says on standard error why there are no observers, and has it stopped at the process's orderly end.
void start_notification_server() noexcept;

}  // namespace quorvel::platform::host
