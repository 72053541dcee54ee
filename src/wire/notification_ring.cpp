#include "wire/notification_ring.h"

#include <algorithm>
#include <utility>

#include "wire/frame.h"

namespace quorvel::wire {

void NotificationRing::append(ByteBuffer frame) noexcept {
  SharedBytes replaced;  // freed without the lock
  const LockHold hold(lock_);
  ++newest_;
  if (!frame.empty()) {
    set_frame_serial({frame.data(), frame.size()}, newest_);
    replaced = SharedBytes::take(frame);
  }
  std::swap(slot(newest_), replaced);
  if (newest_ - forgotten_ > kCapacity) forgotten_ = newest_ - kCapacity;
}

std::uint64_t NotificationRing::newest() noexcept {
  const LockHold hold(lock_);
  return newest_;
}

NotificationRing::Step NotificationRing::step(std::uint64_t position, std::uint64_t end) noexcept {
  const LockHold hold(lock_);
  std::uint64_t gone = std::max(position, forgotten_);
  while (gone < end && !slot(gone + 1)) ++gone;
  if (gone > position) return {{}, gone - position, gone};
  if (position >= end) return {{}, 0, position};
  return {slot(position + 1), 0, position + 1};
}

void NotificationRing::forget(std::uint64_t position) noexcept {
  const LockHold hold(lock_);
  for (position = std::min(position, newest_); forgotten_ < position; ++forgotten_) slot(forgotten_ + 1) = {};
}

}  // namespace quorvel::wire
