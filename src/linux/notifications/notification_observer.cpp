#include "linux/notifications/notification_observer.h"

#include <sys/socket.h>

#include <cerrno>

namespace quorvel::platform::host {

NotificationObserver::NotificationObserver(Descriptor socket, std::uint64_t position) noexcept
    : socket_(std::move(socket)), user_(peer_of(socket_.get()).user), position_(position) {
  tell(wire::FrameKind::ready, position, nullptr);
}

void NotificationObserver::tell(wire::FrameKind kind, std::uint64_t serial, const PropertyValue& value) noexcept {
  ByteBuffer frame;
  if (wire::append_frame(kind, 0, serial, {}, value, frame)) current_ = wire::SharedBytes::take(frame);
  sent_ = 0;
  broken_ = !current_;
}

NotificationObserver::Progress NotificationObserver::send_current() noexcept {
  const std::span<const std::byte> frame = current_.bytes();
  while (sent_ < frame.size()) {
    const ssize_t count = ::send(descriptor(), frame.data() + sent_, frame.size() - sent_, MSG_DONTWAIT | MSG_NOSIGNAL);
    if (count >= 0) {
      sent_ += static_cast<std::size_t>(count);
    } else if (errno == EAGAIN) {
      return Progress::blocked;
    } else if (errno != EINTR) {
      return Progress::gone;
    }
  }
  current_ = wire::SharedBytes();
  sent_ = 0;
  return Progress::done;
}

NotificationObserver::Progress NotificationObserver::send_up_to(std::uint64_t end,
                                                                wire::NotificationRing& ring) noexcept {
  for (;;) {
    if (broken_) return Progress::gone;
    if (const Progress progress = send_current(); progress != Progress::done) return progress;
    if (position_ >= end) return Progress::done;
    wire::NotificationRing::Step step = ring.step(position_, end);
    position_ = step.position;
    if (step.missed != 0) {
      tell(wire::FrameKind::missed, position_, PropertyValue::unsigned_integer(step.missed));
    } else {
      current_ = std::move(step.frame);
    }
  }
}

}  // namespace quorvel::platform::host
