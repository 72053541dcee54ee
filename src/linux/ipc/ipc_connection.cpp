#include "linux/ipc/ipc_connection.h"

#include <malloc.h>
#include <sys/socket.h>
#include <sys/uio.h>

#include <cerrno>
#include <cstring>

#include "property/binary/binary.h"
#include "wire/failure.h"

namespace quorvel::platform {

namespace {

// Room that a worker keeps for encoding replies.
constexpr std::size_t kKeptReplyRoom = 128u << 10;

// Behind a larger reply, memory that its value left free is given back to the system.
constexpr std::size_t kLargeReply = 1u << 20;

[[nodiscard]] const IpcOperation* find_operation(const IpcInterface* interface, std::string_view name) noexcept {
  if (interface == nullptr) return nullptr;
  for (const IpcOperation& operation : interface->operations) {
    if (operation.name == name) return &operation;
  }
  return nullptr;
}

[[nodiscard]] PropertyValue failure_value(const IpcError& error) noexcept {
  PropertyValue value = PropertyValue::dictionary(2);
  const bool complete = value.set(wire::kFailureCodeKey, PropertyValue::integer(error.code)) &&
                        value.set(wire::kFailureDescriptionKey, PropertyValue::string(error.description));
  return complete ? std::move(value) : PropertyValue();
}

[[nodiscard]] bool append_reply(std::uint64_t serial, const PropertyValue& value, const IpcError* error,
                                ByteBuffer& out) noexcept {
  if (error == nullptr) return wire::append_frame(wire::FrameKind::reply, 0, serial, {}, value, out);
  const PropertyValue failure = failure_value(*error);
  return failure && wire::append_frame(wire::FrameKind::failure, 0, serial, {}, failure, out);
}

// Sends what the socket takes at once. The number of bytes, 0 when it takes none now, -1 when the client is gone.
[[nodiscard]] ssize_t send_now(int descriptor, iovec* parts, std::size_t count) noexcept {
  msghdr message = {};
  message.msg_iov = parts;
  message.msg_iovlen = count;
  for (;;) {
    const ssize_t sent = ::sendmsg(descriptor, &message, MSG_DONTWAIT | MSG_NOSIGNAL);
    if (sent >= 0) return sent;
    if (errno == EINTR) continue;
    return errno == EAGAIN ? 0 : -1;
  }
}

[[nodiscard]] iovec part(const std::byte* bytes, std::size_t count) noexcept {
  return {const_cast<std::byte*>(bytes), count};
}

}  // namespace

void IpcReply::send(const PropertyValue& value, const IpcError* error) noexcept {
  IpcConnection* connection = std::exchange(connection_, nullptr);
  if (connection != nullptr) connection->reply(serial_, value, error);
}

void IpcReply::send(const CheckedBytes& value) noexcept {
  IpcConnection* connection = std::exchange(connection_, nullptr);
  if (connection != nullptr) connection->reply(serial_, value);
}

void set_exported_interface(IpcConnection* connection, const IpcInterface* interface) noexcept {
  connection->set_interface(interface);
}

void set_exported_object(IpcConnection* connection, void* object) noexcept { connection->set_object(object); }

void resume(IpcConnection* connection) noexcept { connection->set_resumed(); }

void IpcConnection::run_call(const wire::Frame& frame, host::IpcOutgoing& outgoing) noexcept {
  outgoing_ = &outgoing;
  IpcReply answer((frame.head.flags & wire::kFlagNoReply) == 0 ? this : nullptr, frame.head.serial);
  const IpcOperation* operation = find_operation(interface_, frame.name);
  PropertyValue argument;
  if (!frame.payload.empty()) argument = read_binary(frame.payload, Mutability::immutable);
  if (operation == nullptr) {
    const IpcError error = {kUnknownOperation, "there is no operation of this name"};
    answer.send(nullptr, &error);
  } else if (!frame.payload.empty() && !argument) {
    const IpcError error = {kRefusedArgument, "the argument is not a binary property list"};
    answer.send(nullptr, &error);
  } else {
    operation->invoke(object_, {argument, {peer_.user, peer_.process}}, answer);
  }
  outgoing_ = nullptr;
  // The allocator keeps what a million small parts of a value took, because single ones among them are still in use.
  if (std::exchange(outgoing.was_large, false)) ::malloc_trim(0);
}

void IpcConnection::reply(std::uint64_t serial, const PropertyValue& value, const IpcError* error) noexcept {
  outgoing_->frame.clear();
  const bool complete = append_reply(serial, value, error, outgoing_->frame);
  outgoing_->was_large = outgoing_->frame.size() > kLargeReply;
  finish_reply(complete);
}

void IpcConnection::reply(std::uint64_t serial, const CheckedBytes& value) noexcept {
  outgoing_->frame.clear();
  finish_reply(wire::append_frame(wire::FrameKind::reply, 0, serial, {}, value, outgoing_->frame));
}

void IpcConnection::finish_reply(bool complete) noexcept {
  if (complete) {
    transmit(outgoing_->frame);
  } else {
    broken_ = true;
  }
  outgoing_->frame.clear(kKeptReplyRoom);
}

void IpcConnection::transmit(ByteBuffer& frame) noexcept {
  iovec whole = part(frame.data(), frame.size());
  const ssize_t sent = send_now(descriptor(), &whole, 1);
  if (sent < 0) {
    broken_ = true;
  } else if (static_cast<std::size_t>(sent) < frame.size()) {
    sent_ = static_cast<std::size_t>(sent);
    std::memcpy(head_, frame.data(), sizeof head_);
    waiting_ = outgoing_->waiting->keep(frame);
    broken_ = !waiting_;
  }
}

void IpcConnection::continue_sending() noexcept {
  const std::span<const std::byte> frame = waiting_.bytes();
  iovec parts[2];
  std::size_t count = 0;
  if (sent_ < sizeof head_) parts[count++] = part(head_ + sent_, sizeof head_ - sent_);
  const std::size_t start = sent_ < sizeof head_ ? sizeof head_ : sent_;
  if (start < frame.size()) parts[count++] = part(frame.data() + start, frame.size() - start);
  const ssize_t sent = send_now(descriptor(), parts, count);
  if (sent < 0) {
    broken_ = true;
    return;
  }
  sent_ += static_cast<std::size_t>(sent);
  if (sent_ == frame.size()) waiting_ = wire::SharedBytes();
}

}  // namespace quorvel::platform
