#include "linux/base/event_queue.h"

#include <sys/eventfd.h>

#include <utility>

namespace quorvel::platform::host {

namespace {

[[nodiscard]] bool control(int queue, int operation, int descriptor, std::uint32_t events, void* context) noexcept {
  epoll_event event = {};
  event.events = events;
  event.data.ptr = context;
  return ::epoll_ctl(queue, operation, descriptor, &event) == 0;
}

}  // namespace

bool EventQueue::open() noexcept {
  Descriptor queue(::epoll_create1(EPOLL_CLOEXEC));
  if (!queue) return false;
  epoll_ = std::move(queue);
  return true;
}

bool EventQueue::open_with_bell() noexcept {
  Descriptor queue(::epoll_create1(EPOLL_CLOEXEC));
  if (!queue) return false;
  Descriptor bell(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
  if (!bell || !control(queue.get(), EPOLL_CTL_ADD, bell.get(), EPOLLIN, &bell_)) return false;
  epoll_ = std::move(queue);
  bell_ = std::move(bell);
  return true;
}

bool EventQueue::add(int descriptor, std::uint32_t events, void* context) const noexcept {
  return control(epoll_.get(), EPOLL_CTL_ADD, descriptor, events, context);
}

bool EventQueue::change(int descriptor, std::uint32_t events, void* context) const noexcept {
  return control(epoll_.get(), EPOLL_CTL_MOD, descriptor, events, context);
}

void EventQueue::remove(int descriptor) const noexcept {
  ::epoll_ctl(epoll_.get(), EPOLL_CTL_DEL, descriptor, nullptr);
}

int EventQueue::wait(std::span<epoll_event> events, int milliseconds) const noexcept {
  return ::epoll_wait(epoll_.get(), events.data(), static_cast<int>(events.size()), milliseconds);
}

void EventQueue::ring() const noexcept { ::eventfd_write(bell_.get(), 1); }

void EventQueue::silence() const noexcept {
  eventfd_t count;
  ::eventfd_read(bell_.get(), &count);
}

}  // namespace quorvel::platform::host
