#include "linux/telephony/telephony_center.h"

#include <sys/timerfd.h>
#include <unistd.h>

#include <algorithm>
#include <new>

#include "wire/telephony_answers.h"

namespace quorvel::platform {

namespace {

// Pauses between attempts to reach a service that went away.
constexpr int kFirstDelay = 100;
constexpr int kLongestDelay = 2000;

// How many frames are handled before other sources of the run loop have their turn.
constexpr int kFramesAtOnce = 16;

TelephonyCenter* the_center = nullptr;
bool asked_before = false;

}  // namespace

bool TelephonyCenter::start() noexcept {
  timer_ = Descriptor(::timerfd_create(CLOCK_MONOTONIC, TFD_CLOEXEC | TFD_NONBLOCK));
  delay_ = kFirstDelay;
  return timer_ && stream_.connect();
}

void TelephonyCenter::bind(RunLoop* loop) noexcept {
  if (loop == nullptr || loop_ != nullptr) return;
  timer_source_ = {timer_.get(), try_again, this};
  // The service is not kept waiting for an observer that never reads.
  if (!loop->add(timer_source_, EPOLLIN)) return stream_.close();
  loop_ = loop;
  watch_stream();
}

bool TelephonyCenter::add_observer(void* context, TelephonyObserver observer, const PropertyValue& name) noexcept {
  auto* added = new (std::nothrow) Observer{name, context, observer, nullptr};
  if (added == nullptr) return false;
  *last_link_ = added;
  last_link_ = &added->next;
  return true;
}

void TelephonyCenter::watch_stream() noexcept {
  stream_source_ = {stream_.descriptor(), serve_stream, this};
  if (loop_->add(stream_source_, EPOLLIN)) return;
  stream_.close();
  schedule_try();
}

void TelephonyCenter::serve_stream(void* context) noexcept {
  auto& center = *static_cast<TelephonyCenter*>(context);
  center.stream_source_.has_more = false;
  for (int i = 0; i < kFramesAtOnce; ++i) {
    wire::Frame frame;
    const host::TelephonyStream::Result result = center.stream_.next(frame);
    if (result == host::TelephonyStream::Result::nothing) return;
    if (result == host::TelephonyStream::Result::gone || !center.handle(frame)) return center.lose_service();
  }
  center.stream_source_.has_more = true;
}

// False for what the service cannot have meant to send, and when memory runs out.
bool TelephonyCenter::handle(const wire::Frame& frame) noexcept {
  PropertyValue state = wire::state_of(frame);
  if (!state) return false;
  state_ = std::move(state);
  delay_ = kFirstDelay;
  if (frame.head.kind == wire::FrameKind::event) deliver(frame.name);
  return true;
}

void TelephonyCenter::deliver(std::string_view name) noexcept {
  Observer* const* const end = last_link_;
  for (Observer** link = &first_observer_; link != end; link = &(*link)->next) {
    const Observer& observer = **link;
    if (observer.name.text() == name) observer.call(this, observer.context, observer.name, nullptr, nullptr);
  }
}

void TelephonyCenter::lose_service() noexcept {
  loop_->remove(stream_source_);
  stream_.close();
  state_ = nullptr;
  schedule_try();
}

void TelephonyCenter::schedule_try() noexcept {
  itimerspec once = {};
  once.it_value.tv_sec = delay_ / 1000;
  once.it_value.tv_nsec = delay_ % 1000 * 1'000'000L;
  ::timerfd_settime(timer_.get(), 0, &once, nullptr);
  delay_ = std::min(delay_ * 2, kLongestDelay);
}

void TelephonyCenter::try_again(void* context) noexcept {
  auto& center = *static_cast<TelephonyCenter*>(context);
  std::uint64_t expirations;
  if (::read(center.timer_.get(), &expirations, sizeof expirations) < 0) return;
  if (center.stream_.connect()) {
    center.watch_stream();
  } else {
    center.schedule_try();
  }
}

TelephonyCenter* existing_telephony_center() noexcept { return the_center; }

TelephonyCenter* default_telephony_center() noexcept {
  if (asked_before) return the_center;
  asked_before = true;
  the_center = new (std::nothrow) TelephonyCenter;
  if (the_center != nullptr && !the_center->start()) {
    delete the_center;
    the_center = nullptr;
  }
  return the_center;
}

void bind_to_run_loop(TelephonyCenter* center, RunLoop* loop, RunLoopMode) noexcept { center->bind(loop); }

bool add_telephony_observer(TelephonyCenter* center, void* context, TelephonyObserver observer,
                            const PropertyValue& name) noexcept {
  return center->add_observer(context, observer, name);
}

}  // namespace quorvel::platform
