#include "linux/notifications/notification_server.h"

#include <algorithm>
#include <cerrno>
#include <new>
#include <utility>

#include "linux/base/error_line.h"
#include "linux/base/monotonic_clock.h"
#include "linux/base/thread.h"
#include "wire/service_path.h"

namespace quorvel::platform::host {

namespace {

// As many as a socket lets wait to be accepted, unless the kernel was told otherwise.
constexpr int kLongestQueue = 4096;

}  // namespace

bool NotificationServer::start() noexcept {
  socket_ = ListeningSocket::open(wire::kNotificationSocket);
  if (!socket_) return false;
  if (queue_.open_with_bell()) {
    errno = start_thread(thread_, run_thread, this);
    if (errno == 0) {
      started_ = true;
      running_.store(true, std::memory_order_release);
      return true;
    }
  }
  const int error = errno;
  socket_ = ListeningSocket();
  queue_ = EventQueue();
  errno = error;
  return false;
}

void NotificationServer::begin_to_stop() noexcept {
  if (!running_.exchange(false)) return;
  socket_.remove_file();
  stopping_.store(true, std::memory_order_release);
  queue_.ring();
}

void NotificationServer::stop() noexcept {
  begin_to_stop();
  if (!std::exchange(started_, false)) return;
  if (!join_thread(thread_, end_of_patience())) print_error_line("the thread of the notification center does not end");
}

void NotificationServer::post(ByteBuffer frame) noexcept {
  ring_.append(std::move(frame));
  if (!woken_.exchange(true)) queue_.ring();
}

void* NotificationServer::run_thread(void* server) noexcept {
  name_this_thread("notifications");
  static_cast<NotificationServer*>(server)->run();
  return nullptr;
}

void NotificationServer::run() noexcept {
  listener_.open(queue_, socket_.get(), EPOLLIN);
  while (!stopping_.load(std::memory_order_acquire)) {
    // One event at a time: an observer may end while it is served, and no event of it may be met after that.
    epoll_event event;
    const int count = queue_.wait({&event, 1}, milliseconds_until(listener_.due()));
    if (count > 0) handle(event);
    listener_.wake_when_due(monotonic_milliseconds());
  }
  serve_news();
  while (NotificationObserver* observer = observers_.front()) remove(*observer);
}

void NotificationServer::handle(const epoll_event& event) noexcept {
  if (queue_.is_bell(event) || listener_.is_event(event)) return serve_news();
  auto& observer = *static_cast<NotificationObserver*>(event.data.ptr);
  if ((event.events & (EPOLLHUP | EPOLLERR)) != 0) {
    remove(observer);
  } else {
    serve(observer);
  }
  forget_served();
}

// An observer that connected before a notification was posted receives it. The newest number is therefore read before
// the waiting observers are accepted: each of them starts behind the number of the round before, and so misses none of
// the notifications up to the newest.
void NotificationServer::serve_news() noexcept {
  queue_.silence();
  woken_.store(false);
  const std::uint64_t newest = ring_.newest();
  if (!listener_.is_resting()) accept_waiting();
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
  if (!queue_.change(observer.descriptor(), must_wait ? EPOLLOUT : 0u, &observer)) return remove(observer);
  observer.is_waiting = must_wait;
}

void NotificationServer::remove(NotificationObserver& observer) noexcept {
  queue_.remove(observer.descriptor());
  places_.give_back(observer.user());
  delete &observer;
  listener_.end_rest();
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

// Everybody who is waiting when the round begins. Those who connect without end are left to the next one, so that they
// cannot keep the others from being served.
void NotificationServer::accept_waiting() noexcept {
  for (int accepted = 0; places_.bear_one_more(); ++accepted) {
    if (accepted == kLongestQueue) return;
    Descriptor socket = listener_.accept();
    if (!socket) return;
    if (!take_in(std::move(socket))) return listener_.rest();
    if (places_.are_overfull()) make_room();
  }
  listener_.rest_briefly();
}

// Of the user who has most observers, the newest gives way: those that have listened for long miss nothing.
void NotificationServer::make_room() noexcept {
  const uid_t heaviest = places_.heaviest();
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
  const std::size_t held = places_.take(observer->user());
  if (held == 0) {
    delete observer;
    return false;
  }
  places_.bound_send_room(observer->descriptor(), held);
  if (!queue_.add(observer->descriptor(), 0, observer)) {
    places_.give_back(observer->user());
    delete observer;
    return false;
  }
  observers_.push_back(observer);
  return true;
}

}  // namespace quorvel::platform::host
