#include "quorvel/observer.h"

#include "channel.h"
#include "property/binary/binary.h"
#include "wire/service_path.h"

namespace quorvel::client {
namespace {

constexpr std::uint32_t kMaximumEvent = 16u << 20;

Error protocol_error() {
  return {ErrorCode::protocol_error, 0, "The notification center sent what an observer does not understand."};
}

}  // namespace

class Observer::Connection {
 public:
  explicit Connection(Descriptor descriptor) noexcept : channel_(std::move(descriptor)) {}

  std::optional<Error> take_in(Deadline deadline) {
    wire::Frame frame;
    if (std::optional<Error> error = channel_.receive(frame, kMaximumEvent, deadline)) return error;
    if (frame.head.kind != wire::FrameKind::ready) return protocol_error();
    first_sequence_ = frame.head.serial;
    return {};
  }

  std::optional<Error> next(Event& event, Deadline deadline) {
    wire::Frame frame;
    if (std::optional<Error> error = channel_.receive(frame, kMaximumEvent, deadline)) return error;
    const PropertyValue value = read_binary(frame.payload, Mutability::immutable);
    event = Event{frame.head.serial, 0, std::string(frame.name), {}};
    if (frame.head.kind == wire::FrameKind::notification) {
      event.object = value;
      return {};
    }
    event.missed = value.to_uint64().value_or(0);
    if (frame.head.kind == wire::FrameKind::missed && event.missed > 0) return {};
    return protocol_error();
  }

  [[nodiscard]] std::uint64_t first_sequence() const noexcept { return first_sequence_; }

 private:
  Channel channel_;
  std::uint64_t first_sequence_ = 0;
};

Observer::Observer(Options options) : options_(std::move(options)) {}
Observer::Observer(Observer&&) noexcept = default;
Observer& Observer::operator=(Observer&&) noexcept = default;
Observer::~Observer() = default;

std::optional<Error> Observer::connect() {
  connection_.reset();
  const Deadline deadline = deadline_after(options_.timeout);
  std::optional<Error> error;
  Descriptor descriptor = connect_to_service(options_.root, std::string(wire::kNotificationSocket), deadline, error);
  if (error) return error;
  auto connection = std::make_unique<Connection>(std::move(descriptor));
  error = connection->take_in(deadline);
  if (!error) connection_ = std::move(connection);
  return error;
}

std::uint64_t Observer::first_sequence() const noexcept { return connection_ ? connection_->first_sequence() : 0; }

std::optional<Error> Observer::next(Event& event, std::chrono::milliseconds timeout) {
  if (!connection_) return Error{ErrorCode::disconnected, 0, "The observer is not connected."};
  std::optional<Error> error = connection_->next(event, deadline_after(timeout));
  if (error && error->code != ErrorCode::timed_out) connection_.reset();
  return error;
}

}  // namespace quorvel::client
