#include "client/core/call.h"

#include <algorithm>
#include <utility>

#include "property/binary/binary.h"
#include "wire/failure.h"

namespace quorvel::client {
namespace {

constexpr std::uint64_t kSerial = 1;  // a connection carries one call

Progress refused(const PropertyValue& value, Failure& failure) noexcept {
  const std::string_view description = value.get(wire::kFailureDescriptionKey.text()).text();
  set_failure(failure, ErrorCode::service_failure,
              {description.empty() ? std::string_view("The service refused the call.") : description});
  const std::int64_t code = value.get(wire::kFailureCodeKey.text()).to_int64().value_or(0);
  failure.service_code = static_cast<std::int32_t>(code);
  return Progress::failed;
}

Progress take_reply(const wire::Frame& frame, PropertyValue& reply, Failure& failure) noexcept {
  PropertyValue value;
  if (!frame.payload.empty()) {
    value = read_binary(frame.payload, Mutability::immutable);
    if (!value) {
      set_failure(failure, ErrorCode::protocol_error,
                  {"The service's reply does not hold a property list that can be read."});
      return Progress::failed;
    }
  }
  if (frame.head.kind == wire::FrameKind::failure) return refused(value, failure);
  reply = std::move(value);
  return Progress::done;
}

bool answers_the_call(const wire::FrameHead& head) noexcept {
  return (head.kind == wire::FrameKind::reply || head.kind == wire::FrameKind::failure) && head.serial == kSerial;
}

}  // namespace

bool Call::open(const Target& target, std::string_view operation, const PropertyValue& argument,
                Failure& failure) noexcept {
  deadline_ = moment_after(target.timeout);
  ByteBuffer request;
  if (!wire::append_frame(wire::FrameKind::call, 0, kSerial, operation, argument, request)) {
    set_failure(failure, ErrorCode::invalid_argument, {"The operation's name or argument cannot be sent."});
    return false;
  }
  return connection_.open(target.root, target.service, std::move(request), target.maximum_reply, failure);
}

Progress Call::step(PropertyValue& reply, Failure& failure) noexcept {
  wire::Frame frame;
  const Progress progress = connection_.step(frame, failure);
  if (progress == Progress::failed) return progress;
  // A service may tell of other things first, such as its state on connecting.
  if (progress == Progress::done && answers_the_call(frame.head)) return take_reply(frame, reply, failure);
  if (moment_now() < deadline_) return Progress::waiting;
  set_failure(failure, ErrorCode::timed_out, {"The service did not answer in time."});
  return Progress::failed;
}

Wait Call::wait() const noexcept {
  Wait wait = connection_.wait();
  wait.until = std::min(wait.until, deadline_);
  return wait;
}

}  // namespace quorvel::client
