#include "client/core/connection.h"

#include <poll.h>
#include <sys/socket.h>

#include <algorithm>
#include <cerrno>
#include <utility>

namespace quorvel::client {
namespace {

// A service with a full backlog is there, only busy; a socket of this kind cannot be waited for.
constexpr std::int64_t kFullBacklogPause = 1;
constexpr std::size_t kLeastRead = 16u << 10;
constexpr std::size_t kMostRead = 1u << 20;
constexpr std::size_t kKeptCapacity = 1u << 20;

Progress connection_failed(int error, Failure& failure) noexcept {
  if (error == EPIPE || error == ECONNRESET) {
    set_failure(failure, ErrorCode::disconnected, {"The service ended the connection."});
  } else {
    set_system_failure(failure, ErrorCode::system_failure, {"The connection failed"}, error);
  }
  return Progress::failed;
}

}  // namespace

bool Connection::open(const char* root, std::string_view service, ByteBuffer request, std::uint32_t maximum_body,
                      Failure& failure) noexcept {
  request_ = std::move(request);
  maximum_body_ = maximum_body;
  return socket_.open(root, service, failure);
}

Progress Connection::step(wire::Frame& frame, Failure& failure) noexcept {
  Progress progress = Progress::done;
  if (state_ == State::connecting) progress = connect(failure);
  if (state_ == State::sending && progress == Progress::done) progress = send(failure);
  if (state_ != State::receiving || progress != Progress::done) return progress;
  progress = take_frame(frame, failure);
  if (progress != Progress::waiting) return progress;
  progress = receive(failure);
  return progress == Progress::done ? take_frame(frame, failure) : progress;
}

Wait Connection::wait() const noexcept {
  switch (state_) {
    case State::connecting: return {-1, 0, try_again_};
    case State::sending: return {socket_.descriptor(), POLLOUT, kNever};
    case State::receiving: break;
  }
  return {socket_.descriptor(), POLLIN, frame_is_left_ ? Moment{0} : kNever};
}

Progress Connection::connect(Failure& failure) noexcept {
  switch (socket_.connect(failure)) {
    case ServiceSocket::Step::connected: state_ = State::sending; return Progress::done;
    case ServiceSocket::Step::busy: try_again_ = moment_after(kFullBacklogPause); return Progress::waiting;
    case ServiceSocket::Step::failed: break;
  }
  return Progress::failed;
}

Progress Connection::send(Failure& failure) noexcept {
  while (sent_ < request_.size()) {
    const std::span<const std::byte> left = request_.bytes().subspan(sent_);
    const ssize_t count = ::send(socket_.descriptor(), left.data(), left.size(), MSG_NOSIGNAL);
    if (count >= 0) {
      sent_ += static_cast<std::size_t>(count);
    } else if (errno == EAGAIN) {
      return Progress::waiting;
    } else if (errno == EPIPE) {
      break;  // what the service said before it went is still there to be read
    } else if (errno != EINTR) {
      return connection_failed(errno, failure);
    }
  }
  request_ = ByteBuffer();
  state_ = State::receiving;
  return Progress::waiting;  // no answer can be there yet
}

Progress Connection::receive(Failure& failure) noexcept {
  std::span<std::byte> room = received_.room(kLeastRead, kKeptCapacity);
  if (room.empty()) {
    set_failure(failure, ErrorCode::system_failure, {"Memory does not suffice for what the service sends."});
    return Progress::failed;
  }
  room = room.first(std::min(room.size(), kMostRead));
  ssize_t count;
  do {
    count = ::recv(socket_.descriptor(), room.data(), room.size(), 0);
  } while (count < 0 && errno == EINTR);
  if (count < 0 && errno == EAGAIN) return Progress::waiting;
  if (count <= 0) return connection_failed(count == 0 ? EPIPE : errno, failure);
  received_.arrived(static_cast<std::size_t>(count));
  return Progress::done;
}

Progress Connection::take_frame(wire::Frame& frame, Failure& failure) noexcept {
  switch (received_.next(maximum_body_, frame)) {
    case wire::FrameResult::complete:
      frame_is_left_ = received_.look(maximum_body_) != wire::FrameResult::incomplete;
      return Progress::done;
    case wire::FrameResult::incomplete: return Progress::waiting;
    case wire::FrameResult::refused: break;
  }
  set_failure(failure, ErrorCode::protocol_error,
              {"The service sent bytes that are no frame, or a frame above the limit."});
  return Progress::failed;
}

}  // namespace quorvel::client
