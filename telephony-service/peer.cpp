#include "telephony-service/peer.h"

#include <sys/socket.h>

#include <cerrno>

#include "wire/telephony_state.h"

namespace quorvel::telephony {
namespace {

constexpr std::size_t kReadSize = 64u << 10;

}  // namespace

bool Peer::receive() {
  const std::span<std::byte> room = received_.room(kReadSize, kReadSize);
  if (room.empty()) return false;
  const ssize_t count = platform::host::receive_bytes(connection_.get(), room);
  if (count < 0) return errno == EAGAIN || errno == EINTR;
  if (count == 0) ended_ = true;
  received_.arrived(static_cast<std::size_t>(count));
  return true;
}

wire::FrameResult Peer::next_call(wire::Frame& frame) noexcept {
  const wire::FrameResult result = received_.next(wire::kMaximumStateBody, frame);
  if (result != wire::FrameResult::complete) return result;
  return frame.head.kind == wire::FrameKind::call ? result : wire::FrameResult::refused;
}

bool Peer::send(SharedFrame frame) {
  if (!frame) return false;
  if (waiting_.empty()) frame_started_ = Clock::now();
  waiting_bytes_ += frame->size();
  waiting_.push_back(std::move(frame));
  return flush();
}

bool Peer::flush() {
  while (!waiting_.empty()) {
    const ByteBuffer& frame = *waiting_.front();
    const ssize_t count = ::send(connection_.get(), frame.data() + sent_of_first_, frame.size() - sent_of_first_,
                                 MSG_NOSIGNAL | MSG_DONTWAIT);
    if (count < 0 && errno == EINTR) continue;
    if (count < 0) return errno == EAGAIN;
    sent_of_first_ += static_cast<std::size_t>(count);
    waiting_bytes_ -= static_cast<std::size_t>(count);
    if (sent_of_first_ < frame.size()) continue;
    waiting_.pop_front();
    sent_of_first_ = 0;
    frame_started_ = Clock::now();
  }
  return true;
}

}  // namespace quorvel::telephony
