#include "telephony-service/peer.h"

#include <sys/socket.h>

#include <cerrno>

#include "wire/telephony_state.h"

namespace quorvel::telephony {
namespace {

constexpr std::size_t kReadSize = 64u << 10;

}  // namespace

bool Peer::receive() {
  received_.consume(taken_);
  taken_ = 0;
  if (received_.empty()) received_.clear(kReadSize);
  std::byte bytes[kReadSize];
  const ssize_t count = ::recv(connection_.get(), bytes, sizeof bytes, 0);
  if (count < 0) return errno == EAGAIN || errno == EINTR;
  if (count == 0) ended_ = true;
  return received_.append(bytes, static_cast<std::size_t>(count));
}

wire::FrameResult Peer::next_call(wire::Frame& frame) noexcept {
  const wire::FrameResult result = wire::parse_frame(received_.bytes().subspan(taken_), wire::kMaximumStateBody, frame);
  if (result != wire::FrameResult::complete) return result;
  if (frame.head.kind != wire::FrameKind::call) return wire::FrameResult::refused;
  taken_ += wire::kFrameHeadSize + frame.head.body_length;
  return result;
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
