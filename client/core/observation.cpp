#include "client/core/observation.h"

#include <algorithm>

#include "property/binary/binary.h"
#include "wire/service_path.h"

namespace quorvel::client {
namespace {

constexpr std::uint32_t kMaximumNotice = 16u << 20;
constexpr std::string_view kService =
    wire::kNotificationSocket.substr(0, wire::kNotificationSocket.size() - wire::kSocketSuffix.size());

}  // namespace

bool Observation::open(const Target& target, Failure& failure) noexcept {
  deadline_ = moment_after(target.timeout);
  return connection_.open(target.root, kService, {}, kMaximumNotice, failure);
}

Progress Observation::step(Notice& notice, Failure& failure) noexcept {
  wire::Frame frame;
  const Progress progress = connection_.step(frame, failure);
  if (progress == Progress::failed) return progress;
  if (progress == Progress::done) {
    if (take_notice(frame, notice)) return Progress::done;
    set_failure(failure, ErrorCode::protocol_error,
                {"The notification center sent a frame that an observer does not understand."});
    return Progress::failed;
  }
  if (moment_now() < deadline_) return Progress::waiting;
  set_failure(failure, ErrorCode::timed_out, {"The notification center did not take the observer in in time."});
  return Progress::failed;
}

Wait Observation::wait() const noexcept {
  Wait wait = connection_.wait();
  wait.until = std::min(wait.until, deadline_);
  return wait;
}

bool Observation::take_notice(const wire::Frame& frame, Notice& notice) noexcept {
  PropertyValue value = read_binary(frame.payload, Mutability::immutable);
  if (!value && !frame.payload.empty()) return false;
  notice = Notice{Notice::Kind::taken_in, frame.head.serial, 0, frame.name, {}};
  if (!taken_in_) {
    taken_in_ = frame.head.kind == wire::FrameKind::ready;
    deadline_ = kNever;
    return taken_in_;
  }
  if (frame.head.kind == wire::FrameKind::notification) {
    notice.kind = Notice::Kind::notification;
    notice.object = std::move(value);
    return true;
  }
  notice.kind = Notice::Kind::missed;
  notice.missed = value.to_uint64().value_or(0);
  return frame.head.kind == wire::FrameKind::missed && notice.missed > 0;
}

}  // namespace quorvel::client
