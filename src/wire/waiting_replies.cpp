#include "wire/waiting_replies.h"

#include <cstring>

#include "wire/frame.h"

namespace quorvel::wire {

namespace {

// Smaller frames are kept apart, so that they do not push a large one out of the comparison.
constexpr std::size_t kWorthSharing = 4096;

[[nodiscard]] bool equal_behind_head(std::span<const std::byte> left, std::span<const std::byte> right) noexcept {
  return left.size() == right.size() &&
         std::memcmp(left.data() + kFrameHeadSize, right.data() + kFrameHeadSize, left.size() - kFrameHeadSize) == 0;
}

}  // namespace

SharedBytes WaitingReplies::keep(ByteBuffer& frame) noexcept {
  if (frame.size() < kWorthSharing) return SharedBytes::take(frame);
  SharedBytes latest;
  {
    const LockHold hold(lock_);
    latest = latest_;
  }
  // Compared without the lock: that takes as long as the frame is large.
  if (latest && equal_behind_head(latest.bytes(), frame.bytes())) return latest;
  latest = SharedBytes::take(frame);
  SharedBytes replaced = latest;
  const LockHold hold(lock_);
  std::swap(latest_, replaced);
  return latest;
}

void WaitingReplies::forget_unused() noexcept {
  SharedBytes unused;
  const LockHold hold(lock_);
  if (latest_.is_sole_holder()) std::swap(latest_, unused);
}

}  // namespace quorvel::wire
