#include "linux/notifications/notification_server.h"

#include <sys/eventfd.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <new>

#include "linux/base/connection_limit.h"
#include "linux/base/error_line.h"
#include "linux/base/monotonic_clock.h"
#include "linux/base/thread.h"
#include "wire/service_path.h"

namespace quorvel::platform::host {

bool NotificationServer::watch(int descriptor, std::uint32_t events, void* who, int operation) noexcept {
  epoll_event event = {};
  event.events = events;
  event.data.ptr = who;
  return ::epoll_ctl(epoll_.get(), operation, descriptor, &event) == 0;
}

bool NotificationServer::start() noexcept {
  socket_ = ListeningSocket::open(wire::kNotificationSocket);
  if (!socket_) return false;
  epoll_ = Descriptor(::epoll_create1(EPOLL_CLOEXEC));
  wake_ = Descriptor(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
  if (epoll_ && wake_ && watch(wake_.get(), EPOLLIN, &wake_, EPOLL_CTL_ADD) &&
      watch(socket_.get(), EPOLLIN, &socket_, EPOLL_CTL_ADD)) {
    errno = start_thread(thread_, run_thread, this);
    if (errno == 0) {
      running_.store(true, std::memory_order_release);
      return true;
    }
  }
  socket_ = ListeningSocket();
  wake_ = Descriptor();
  epoll_ = Descriptor();
  return false;
}

void NotificationServer::stop() noexcept {
  if (!running_.exchange(false)) return;
  socket_.remove_file();
  stopping_.store(true, std::memory_order_release);
  ::eventfd_write(wake_.get(), 1);
  if (!join_thread(thread_, end_of_patience())) print_error_line("the thread of the notification center does not end");
}

void NotificationServer::post(ByteBuffer frame) noexcept {
  ring_.append(std::move(frame));
  if (!woken_.exchange(true)) ::eventfd_write(wake_.get(), 1);
}

void* NotificationServer::run_thread(void* server) noexcept {
  name_this_thread("notifications");
  static_cast<NotificationServer*>(server)->run();
  return nullptr;
}

void NotificationServer::run() noexcept {
  while (!stopping_.load(std::memory_order_acquire)) {
    // One event at a time: an observer may end while it is served, and no event of it may be met after that.
    epoll_event event;
    const int count = ::epoll_wait(epoll_.get(), &event, 1, listen_again_ != 0 ? kAcceptRestMilliseconds : -1);
    if (count > 0) handle(event);
    if (listen_again_ != 0 && monotonic_milliseconds() >= listen_again_) listen();
  }
  serve_news();
  while (NotificationObserver* observer = observers_.front()) remove(*observer);
}

void NotificationServer::handle(const epoll_event& event) noexcept {
  if (event.data.ptr == &wake_ || event.data.ptr == &socket_) return serve_news();
  auto& observer = *static_cast<NotificationObserver*>(event.data.ptr);
  if ((event.events & (EPOLLHUP | EPOLLERR)) != 0) {
    remove(observer);
  } else {
    serve(observer);
  }
  forget_served();
}

// Whoever was connected before a notification was posted receives it. So the newest number is read first: everybody
// who was connected before one of the numbers up to it is then accepted here or was accepted before, and starts from
// the number of the round before.
void NotificationServer::serve_news() noexcept {
  eventfd_t count;
  ::eventfd_read(wake_.get(), &count);
  woken_.store(false);
  const std::uint64_t newest = ring_.newest();
  if (listen_again_ == 0) accept_all();
  served_ = newest;
  NotificationObserver* next = nullptr;
  for (NotificationObserver* observer = observers_.front(); observer != nullptr; observer = next) {
    next = observers_.after(observer);
    if (!observer->is_waiting) serve(*observer);
  }
  forget_served();
}

void NotificationServer::serve(NotificationObserver& observer) noexcept {
  const Progress progress = observer.send_up_to(served_, ring_);
  if (progress == Progress::gone) return remove(observer);
  const bool must_wait = progress == Progress::blocked;
  if (must_wait == observer.is_waiting) return;
  if (!watch(observer.descriptor(), must_wait ? EPOLLOUT : 0u, &observer, EPOLL_CTL_MOD)) return remove(observer);
  observer.is_waiting = must_wait;
}

void NotificationServer::remove(NotificationObserver& observer) noexcept {
  shares_.remove(observer.user());
  delete &observer;
  --observer_count_;
  // A descriptor is free again.
  if (listen_again_ != 0) listen_again_ = monotonic_milliseconds();
}

// Lets go of what every observer has been given. Those to come start from what was served last.
void NotificationServer::forget_served() noexcept {
  std::uint64_t position = served_;
  for (const NotificationObserver* observer = observers_.front(); observer != nullptr;
       observer = observers_.after(observer)) {
    position = std::min(position, observer->position());
  }
  ring_.forget(position);
}

void NotificationServer::accept_all() noexcept {
  for (;;) {
    Descriptor socket(::accept4(socket_.get(), nullptr, nullptr, SOCK_NONBLOCK | SOCK_CLOEXEC));
    if (!socket && (errno == EINTR || errno == ECONNABORTED)) continue;
    if (!socket && errno == EAGAIN) return;
    if (!socket || !take_in(std::move(socket))) return rest();
    if (observer_count_ > observer_connection_limit()) make_room();
  }
}

// Of the user who has most observers, the newest gives way: those that have listened for long miss nothing.
void NotificationServer::make_room() noexcept {
  const uid_t heaviest = shares_.heaviest();
  NotificationObserver* newest = nullptr;
  for (NotificationObserver* observer = observers_.front(); observer != nullptr;
       observer = observers_.after(observer)) {
    if (observer->user() == heaviest) newest = observer;
  }
  if (newest != nullptr) remove(*newest);
}

bool NotificationServer::take_in(Descriptor socket) noexcept {
  auto* observer = new (std::nothrow) NotificationObserver(std::move(socket), served_);
  if (observer == nullptr) return false;
  if (shares_.add(observer->user()) == 0) {
    delete observer;
    return false;
  }
  if (!watch(observer->descriptor(), 0, observer, EPOLL_CTL_ADD)) {
    shares_.remove(observer->user());
    delete observer;
    return false;
  }
  observers_.push_back(observer);
  ++observer_count_;
  return true;
}

void NotificationServer::listen() noexcept {
  listen_again_ = 0;
  if (!watch(socket_.get(), EPOLLIN, &socket_, EPOLL_CTL_ADD)) {
    listen_again_ = monotonic_milliseconds() + kAcceptRestMilliseconds;
  }
}

// A listener that cannot be accepted from stays readable and would keep the thread awake.
void NotificationServer::rest() noexcept {
  if (listen_again_ != 0) return;
  ::epoll_ctl(epoll_.get(), EPOLL_CTL_DEL, socket_.get(), nullptr);
  listen_again_ = monotonic_milliseconds() + kAcceptRestMilliseconds;
}

}  // namespace quorvel::platform::host
