#include "channel.h"

#include <poll.h>
#include <sys/socket.h>

#include <cerrno>
#include <cstring>

namespace quorvel::client {
namespace {

constexpr std::size_t kReadSize = 64u << 10;
constexpr std::size_t kKeptCapacity = 1u << 20;

Error timed_out() { return {ErrorCode::timed_out, 0, "The service did not answer in time."}; }
Error disconnected() { return {ErrorCode::disconnected, 0, "The service ended the connection."}; }
Error out_of_memory() { return {ErrorCode::system_failure, 0, "Memory does not suffice for what the service sent."}; }

std::optional<Error> after_failed_call(int error) {
  if (error == EPIPE || error == ECONNRESET) return disconnected();
  return Error{ErrorCode::system_failure, 0, std::string("The connection failed: ") + std::strerror(error)};
}

}  // namespace

std::optional<Error> Channel::send(std::span<const std::byte> bytes, Deadline deadline) {
  while (!bytes.empty()) {
    const ssize_t sent = ::send(connection_.get(), bytes.data(), bytes.size(), MSG_NOSIGNAL);
    if (sent >= 0) {
      bytes = bytes.subspan(static_cast<std::size_t>(sent));
    } else if (errno == EAGAIN) {
      if (!wait_until_ready(connection_.get(), POLLOUT, deadline)) return timed_out();
    } else if (errno != EINTR) {
      return after_failed_call(errno);
    }
  }
  return {};
}

std::optional<Error> Channel::receive(wire::Frame& frame, std::uint32_t maximum_body, Deadline deadline) {
  for (;;) {
    switch (wire::parse_frame(received_.bytes().subspan(taken_), maximum_body, frame)) {
      case wire::FrameResult::complete: taken_ += wire::kFrameHeadSize + frame.head.body_length; return {};
      case wire::FrameResult::refused:
        return Error{ErrorCode::protocol_error, 0, "The service sent what is no frame, or a reply above the limit."};
      case wire::FrameResult::incomplete:
        if (std::optional<Error> error = receive_bytes(deadline)) return error;
    }
  }
}

std::optional<Error> Channel::receive_bytes(Deadline deadline) {
  received_.consume(taken_);
  taken_ = 0;
  if (received_.empty()) received_.clear(kKeptCapacity);
  for (;;) {
    if (!wait_until_ready(connection_.get(), POLLIN, deadline)) return timed_out();
    std::byte bytes[kReadSize];
    const ssize_t count = ::recv(connection_.get(), bytes, sizeof bytes, 0);
    if (count == 0) return disconnected();
    if (count > 0) {
      if (!received_.append(bytes, static_cast<std::size_t>(count))) return out_of_memory();
      return {};
    }
    if (errno != EINTR && errno != EAGAIN) return after_failed_call(errno);
  }
}

}  // namespace quorvel::client
