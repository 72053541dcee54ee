#include "readiness.h"

#include <poll.h>
#include <sys/epoll.h>
#include <sys/timerfd.h>

#include <cerrno>

namespace quorvel::capi {
namespace {

bool watch(const Descriptor& epoll, int operation, int descriptor, std::uint32_t events) noexcept {
  epoll_event event{};
  event.events = events;
  return ::epoll_ctl(epoll.get(), operation, descriptor, &event) == 0;
}

bool report(client::Failure& failure) noexcept {
  set_system_failure(failure, client::ErrorCode::system_failure, {"No descriptor to poll can be had"}, errno);
  return false;
}

}  // namespace

bool Readiness::open(client::Failure& failure) noexcept {
  epoll_ = Descriptor(::epoll_create1(EPOLL_CLOEXEC));
  timer_ = Descriptor(::timerfd_create(CLOCK_MONOTONIC, TFD_CLOEXEC | TFD_NONBLOCK));
  return (epoll_ && timer_ && watch(epoll_, EPOLL_CTL_ADD, timer_.get(), EPOLLIN)) || report(failure);
}

bool Readiness::follow(const client::Wait& wait, client::Failure& failure) noexcept {
  return (follow_events(wait) && follow_time(wait.until)) || report(failure);
}

bool Readiness::follow_events(const client::Wait& wait) noexcept {
  if (wait.descriptor < 0 || wait.events == events_) return true;
  const std::uint32_t events = (wait.events & POLLOUT) != 0 ? EPOLLOUT : EPOLLIN;
  if (!watch(epoll_, events_ == 0 ? EPOLL_CTL_ADD : EPOLL_CTL_MOD, wait.descriptor, events)) return false;
  events_ = wait.events;
  return true;
}

bool Readiness::follow_time(client::Moment until) noexcept {
  if (until == until_) return true;
  itimerspec time{};  // all zero: never
  if (until != client::kNever) {
    time.it_value.tv_sec = until / 1'000'000'000;
    time.it_value.tv_nsec = until > 0 ? until % 1'000'000'000 : 1;
  }
  if (::timerfd_settime(timer_.get(), TFD_TIMER_ABSTIME, &time, nullptr) != 0) return false;
  until_ = until;
  return true;
}

}  // namespace quorvel::capi
