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

bool FrameInput::borrow(std::span<const std::byte> bytes) noexcept {
  if (!bytes_.empty()) return bytes_.append(bytes.data(), bytes.size());
  borrowed_ = bytes;
  return true;
}

bool FrameInput::keep() noexcept {
  const std::span<const std::byte> borrowed = std::exchange(borrowed_, {});
  bytes_.consume(std::exchange(taken_, 0));
  if (bytes_.empty() && borrowed.empty()) bytes_.clear(0);
  return bytes_.append(borrowed.data(), borrowed.size());
}

FrameResult FrameInput::next(std::uint32_t maximum_body, Frame& frame) noexcept {
  const FrameResult result = parse_frame(rest(), maximum_body, frame);
  if (result != FrameResult::complete) return result;
  const std::size_t size = kFrameHeadSize + frame.head.body_length;
  if (borrowed_.empty()) {
    taken_ += size;
  } else {
    borrowed_ = borrowed_.subspan(size);
  }
  return result;
}

FrameResult FrameInput::look(std::uint32_t maximum_body) const noexcept {
  Frame frame;
  return parse_frame(rest(), maximum_body, frame);
}

}  // namespace quorvel::wire
