#include "quorvel/client.h"

#include <system_error>

#include "channel.h"
#include "property/binary/binary.h"
#include "protocol/quorvel_protocol.h"
#include "wire/service_path.h"

namespace quorvel::client {
namespace {

constexpr std::uint64_t kSerial = 1;  // a connection carries one call

Reply failed(Error error) { return {{}, std::move(error)}; }

Error protocol_error(const char* description) { return {ErrorCode::protocol_error, 0, description}; }

Reply take_reply(const wire::Frame& frame) {
  PropertyValue value;
  if (!frame.payload.empty()) {
    value = read_binary(frame.payload, Mutability::immutable);
    if (!value) return failed(protocol_error("The service's reply does not hold a property list that can be read."));
  }
  if (frame.head.kind == wire::FrameKind::reply) return {std::move(value), {}};
  const std::int64_t code = value.get("Code").to_int64().value_or(0);
  std::string description(value.get("Description").text());
  if (description.empty()) description = "The service refused the call.";
  return failed({ErrorCode::service_failure, static_cast<std::int32_t>(code), std::move(description)});
}

}  // namespace

Reply Client::call(std::string_view operation, const PropertyValue& argument) const {
  ByteBuffer request;
  if (!wire::append_frame(wire::FrameKind::call, 0, kSerial, operation, argument, request)) {
    return failed({ErrorCode::invalid_argument, 0, "The operation's name or argument cannot be sent."});
  }
  const Deadline deadline = deadline_after(options_.timeout);
  const std::string_view service = options_.service.empty() ? protocol::kServiceName : options_.service;
  const std::string socket = std::string(service).append(wire::kSocketSuffix);
  std::optional<Error> error;
  Channel channel(connect_to_service(options_.root, socket, deadline, error));
  if (!error) error = channel.send(request.bytes(), deadline);
  while (!error) {
    wire::Frame frame;
    error = channel.receive(frame, options_.maximum_reply, deadline);
    if (error) break;
    // A service may tell of other things first, such as its state on connecting.
    const bool answers = frame.head.kind == wire::FrameKind::reply || frame.head.kind == wire::FrameKind::failure;
    if (answers && frame.head.serial == kSerial) return take_reply(frame);
  }
  return failed(std::move(*error));
}

PendingCall Client::call(std::string_view operation, const PropertyValue& argument, Completion completion) const {
  auto run = [client = *this, name = std::string(operation), argument, completion] {
    completion(client.call(name, argument));
  };
  try {
    return PendingCall(std::thread(run));
  } catch (const std::system_error& refusal) {
    completion(failed({ErrorCode::system_failure, 0, std::string("No thread can be had: ") + refusal.what()}));
    return {};
  }
}

Reply Client::copy_regulatory_images() const { return call(protocol::kCopyRegulatoryImages); }

PendingCall Client::copy_regulatory_images(Completion completion) const {
  return call(protocol::kCopyRegulatoryImages, {}, std::move(completion));
}

void PendingCall::wait() noexcept {
  if (!thread_.joinable()) return;
  if (thread_.get_id() == std::this_thread::get_id()) {
    thread_.detach();
  } else {
    thread_.join();
  }
}

}  // namespace quorvel::client
