#include "wire/frame_input.h"

#include <algorithm>
#include <utility>

namespace quorvel::wire {

std::span<std::byte> FrameInput::room(std::size_t least, std::size_t kept) noexcept {
  bytes_.consume(std::exchange(taken_, 0));
  if (bytes_.empty()) bytes_.clear(kept);
  const std::size_t size = bytes_.size();
  if (bytes_.capacity() - size < least && !bytes_.reserve(std::max(size + least, 2 * size))) return {};
  return {bytes_.data() + size, bytes_.capacity() - size};
}

void FrameInput::arrived(std::size_t count) noexcept {
  // Within the room that was made, so nothing is allocated.
  static_cast<void>(bytes_.resize(bytes_.size() + count));
}

FrameResult FrameInput::next(std::uint32_t maximum_body, Frame& frame) noexcept {
  const FrameResult result = parse_frame(bytes_.bytes().subspan(taken_), maximum_body, frame);
  if (result == FrameResult::complete) taken_ += kFrameHeadSize + frame.head.body_length;
  return result;
}

FrameResult FrameInput::look(std::uint32_t maximum_body) const noexcept {
  Frame frame;
  return parse_frame(bytes_.bytes().subspan(taken_), maximum_body, frame);
}

}  // namespace quorvel::wire
