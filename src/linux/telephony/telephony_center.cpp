#include "linux/telephony/telephony_center.h"

#include <fcntl.h>
#include <sys/inotify.h>
#include <sys/timerfd.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <new>
#include <string_view>
#include <utility>

#include "linux/base/error_line.h"
#include "linux/base/local_socket.h"
#include "linux/process/service_manager.h"
#include "linux/telephony/telephony_trouble.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"
#include "wire/service_path.h"
#include "wire/telephony_answers.h"

namespace quorvel::platform {

namespace {

// Pauses between attempts to reach a service that is there but does not answer, in milliseconds.
constexpr int kFirstDelay = 100;
constexpr int kLongestDelay = 2000;

// How many frames are handled before other sources of the run loop have their turn.
constexpr int kFramesAtOnce = 16;

TelephonyCenter* the_center = nullptr;
bool asked_before = false;

}  // namespace

bool TelephonyCenter::start() noexcept {
  timer_ = Descriptor(::timerfd_create(CLOCK_MONOTONIC, TFD_CLOEXEC | TFD_NONBLOCK));
  directory_ = Descriptor(::inotify_init1(IN_CLOEXEC | IN_NONBLOCK));
  delay_ = kFirstDelay;
  return static_cast<bool>(timer_);
}

void TelephonyCenter::bind(RunLoop* loop) noexcept {
  if (loop == nullptr || loop_ != nullptr) return;
  timer_source_ = {timer_.get(), try_again, this};
  directory_source_ = {directory_.get(), serve_directory, this};
  if (!loop->add(timer_source_, EPOLLIN)) return;
  loop_ = loop;
  if (directory_ && !loop->add(directory_source_, EPOLLIN)) directory_ = Descriptor();
  watch_directory();
  look_for_service();
}

// Without a watch the service is looked for by timer.
void TelephonyCenter::watch_directory() noexcept {
  if (directory_watch_ >= 0) return;
  const Descriptor directory = host::open_service_directory();
  char path[32];
  std::snprintf(path, sizeof path, "/proc/self/fd/%d", directory.get());
  if (directory) {
    directory_watch_ = ::inotify_add_watch(
        directory_.get(), path, IN_CREATE | IN_MOVED_TO | IN_ATTRIB | IN_MOVE_SELF | IN_DELETE_SELF | IN_ONLYDIR);
  }
  if (directory_watch_ < 0 && host::should_tell(host::TelephonyTrouble::directory, errno)) {
    host::print_system_error("cannot watch %s for the telephony service", wire::kServiceDirectory.data());
  }
}

void TelephonyCenter::serve_directory(void* context) noexcept {
  auto& center = *static_cast<TelephonyCenter*>(context);
  alignas(inotify_event) char events[4096];
  const ssize_t size = ::read(center.directory_.get(), events, sizeof events);
  bool has_changed = false;
  for (ssize_t at = 0; at < size;) {
    const auto& event = *reinterpret_cast<const inotify_event*>(events + at);
    at += static_cast<ssize_t>(sizeof event + event.len);
    has_changed |= event.len == 0 || std::string_view(event.name) == wire::kTelephonySocket;
    // The directory is not at its place any more; the timer finds its successor.
    if ((event.mask & (IN_MOVE_SELF | IN_DELETE_SELF)) != 0 && center.directory_watch_ >= 0) {
      ::inotify_rm_watch(center.directory_.get(), std::exchange(center.directory_watch_, -1));
    }
  }
  if (!has_changed || center.stream_.is_open()) return;
  center.delay_ = kFirstDelay;
  center.look_for_service();
}

void TelephonyCenter::look_for_service() noexcept {
  switch (stream_.connect()) {
    case host::TelephonyStream::Connection::open: return watch_stream();
    case host::TelephonyStream::Connection::busy:
      say("Listening; the telephony service cannot be followed: standard error says why");
      return schedule_try();
    case host::TelephonyStream::Connection::barred:
      say("Listening; the telephony service cannot be followed: standard error says why");
      // The refusal may pass within a moment. A lasting one ends with a change in the directory, which is watched.
      if (delay_ < kLongestDelay) return schedule_try();
      break;
    case host::TelephonyStream::Connection::absent: say("Listening; waiting for the telephony service"); break;
  }
  if (directory_watch_ < 0) schedule_try();
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

// False for a frame that the service cannot have meant to send, and when memory runs out.
bool TelephonyCenter::handle(const wire::Frame& frame) noexcept {
  PropertyValue state = wire::state_of(frame);
  if (!state) {
    stream_.tell_unusable(frame);
    return false;
  }
  keep_telephony_state(std::move(state));
  delay_ = kFirstDelay;
  say("Listening; following the telephony service");
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
  keep_telephony_state(nullptr);
  say("Listening; the telephony service is gone");
  schedule_try();
}

// The service manager is sent the status that it shows whenever that changes.
void TelephonyCenter::say(const char* status) noexcept {
  if (status != status_) host::report_status(status);
  status_ = status;
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
  if (center.stream_.is_open()) return;
  center.watch_directory();
  center.look_for_service();
}

TelephonyCenter* default_telephony_center() noexcept {
  if (asked_before) return the_center;
  asked_before = true;
  if (!Descriptor(open_file(paths::kTelephonyMark, O_PATH, 0)) && !host::TelephonyStream::has_place()) {
    host::report_status("Listening; this device has no telephony service");
    return nullptr;
  }
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
