// A listener of the IPC service with its socket and its workers.
#pragma once

#include <cstddef>
#include <string_view>

#include "linux/base/connection_limit.h"
#include "linux/base/local_socket.h"
#include "linux/base/places.h"
#include "linux/ipc/ipc_worker.h"
#include "platform/ipc.h"
#include "wire/waiting_replies.h"

namespace quorvel::platform {

class IpcListener {
 public:
  IpcListener() noexcept = default;
  IpcListener(const IpcListener&) = delete;
  IpcListener& operator=(const IpcListener&) = delete;
  ~IpcListener() = default;

  [[nodiscard]] bool set_service_name(std::string_view name) noexcept;
  void set_delegate(IpcDelegate delegate) noexcept { delegate_ = delegate; }
  /// `resume` of the platform's interface.
  [[nodiscard]] int start() noexcept;
  /// Takes the socket away and ends the threads. False when one of them does not come back: the listener then belongs
  /// to it until the process ends. Main thread.
  [[nodiscard]] bool stop() noexcept;

  /// For the workers, on their threads.
  [[nodiscard]] int descriptor() const noexcept { return socket_.get(); }
  [[nodiscard]] wire::WaitingReplies& waiting_replies() noexcept { return waiting_replies_; }
  [[nodiscard]] bool accepts(IpcConnection& connection) noexcept;
  [[nodiscard]] host::IpcWorker& least_loaded() noexcept;
  /// Who holds the places of all workers' connections, and the bytes of calls that are not whole yet.
  [[nodiscard]] host::Places& places() noexcept { return places_; }
  /// Wakes the workers other than `worker` to make room: it has none of the connections that should give way.
  void ask_others_for_room(const host::IpcWorker& worker) noexcept;

 private:
  static constexpr std::size_t kMinimumWorkers = 2;
  static constexpr std::size_t kMaximumWorkers = 4;

  // What connections may hold of calls that are not whole yet, all of them together.
  static constexpr std::size_t kHeldInputBudget = 4u << 20;

  [[nodiscard]] int open_socket() noexcept;
  [[nodiscard]] int start_workers() noexcept;

  char socket_name_[108] = {};
  IpcDelegate delegate_ = {};
  host::ListeningSocket socket_;
  wire::WaitingReplies waiting_replies_;
  host::Places places_{host::client_connection_limit, kHeldInputBudget};
  std::size_t worker_count_ = 0;  // settled before the first worker starts
  host::IpcWorker workers_[kMaximumWorkers];
};

}  // namespace quorvel::platform
