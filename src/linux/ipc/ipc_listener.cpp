#include "linux/ipc/ipc_listener.h"

#include <sched.h>
#include <sysexits.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <new>
#include <utility>

#include "linux/base/error_line.h"
#include "linux/base/thread.h"
#include "linux/process/service_manager.h"
#include "wire/service_path.h"

namespace quorvel::platform {

namespace {

[[nodiscard]] std::size_t hardware_threads() noexcept {
  cpu_set_t set;
  if (::sched_getaffinity(0, sizeof set, &set) != 0) return 0;
  return static_cast<std::size_t>(CPU_COUNT(&set));
}

}  // namespace

bool IpcListener::set_service_name(std::string_view name) noexcept {
  const int length = std::snprintf(socket_name_, sizeof socket_name_, "%.*s%s", static_cast<int>(name.size()),
                                   name.data(), wire::kSocketSuffix.data());
  return length >= 0 && static_cast<std::size_t>(length) < sizeof socket_name_;
}

int IpcListener::open_socket() noexcept {
  if (Descriptor passed = host::take_passed_socket()) {
    socket_ = host::ListeningSocket(std::move(passed));
    return 0;
  }
  socket_ = host::ListeningSocket::open(socket_name_);
  if (socket_) return 0;
  if (errno == EADDRINUSE) {
    host::print_error_line("another process serves %s/%s", wire::kServiceDirectory.data(), socket_name_);
    return EX_UNAVAILABLE;
  }
  host::print_system_error("cannot listen on %s/%s", wire::kServiceDirectory.data(), socket_name_);
  return EX_OSERR;
}

int IpcListener::start_workers() noexcept {
  worker_count_ = std::clamp(hardware_threads(), kMinimumWorkers, kMaximumWorkers);
  bool working = true;
  for (std::size_t i = 0; working && i < worker_count_; ++i) working = workers_[i].prepare(*this);
  for (std::size_t i = 0; working && i < worker_count_; ++i) working = workers_[i].start();
  if (working) return 0;
  host::print_system_error("cannot start the threads of the IPC service");
  return EX_OSERR;
}

int IpcListener::start() noexcept {
  const int status = open_socket();
  return status != 0 ? status : start_workers();
}

bool IpcListener::stop() noexcept {
  socket_.remove_file();
  // All of them at once, so that none hands a new connection to one that has ended.
  for (host::IpcWorker& worker : workers_) worker.begin_to_stop();
  const std::int64_t deadline = host::end_of_patience();
  bool ended = true;
  for (host::IpcWorker& worker : workers_) ended &= worker.wait_for_end(deadline);
  return ended;
}

bool IpcListener::accepts(IpcConnection& connection) noexcept {
  return delegate_.accept != nullptr && delegate_.accept(delegate_.object, this, &connection) &&
         connection.is_resumed();
}

host::IpcWorker& IpcListener::least_loaded() noexcept {
  return *std::min_element(workers_, workers_ + worker_count_,
                           [](const host::IpcWorker& left, const host::IpcWorker& right) {
                             return left.connection_count() < right.connection_count();
                           });
}

void IpcListener::ask_others_for_room(const host::IpcWorker& worker) noexcept {
  for (std::size_t i = 0; i < worker_count_; ++i) {
    if (&workers_[i] != &worker) workers_[i].ask_for_room();
  }
}

IpcListener* create_listener(std::string_view service_name) noexcept {
  auto* listener = new (std::nothrow) IpcListener;
  if (listener != nullptr && listener->set_service_name(service_name)) return listener;
  delete listener;
  return nullptr;
}

void set_delegate(IpcListener* listener, IpcDelegate delegate) noexcept { listener->set_delegate(delegate); }

int resume(IpcListener* listener) noexcept { return listener->start(); }

void release_listener(IpcListener* listener) noexcept {
  if (listener->stop()) {
    delete listener;
  } else {
    host::print_error_line("a thread of the IPC service does not end; it is left behind");
  }
}

}  // namespace quorvel::platform
