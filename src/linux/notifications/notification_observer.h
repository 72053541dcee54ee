// One reader of the notification center's socket. It never has to say anything, and is never read from.
#pragma once

#include <cstddef>
#include <cstdint>

#include "linux/base/attached_descriptors.h"
#include "linux/base/intrusive_list.h"
#include "linux/base/places.h"
#include "platform/descriptor.h"
#include "wire/frame.h"
#include "wire/notification_ring.h"
#include "wire/shared_bytes.h"

namespace quorvel::platform::host {

class NotificationObserver : public ListLink {
 public:
  enum class Progress { done, blocked, gone };

  /// Greets the observer with `position`: it receives what comes after.
  NotificationObserver(Descriptor socket, std::uint64_t position) noexcept;

  ~NotificationObserver() { close_connection(std::move(socket_)); }

  [[nodiscard]] int descriptor() const noexcept { return socket_.get(); }
  [[nodiscard]] uid_t user() const noexcept { return user_; }
  /// The newest notification that the observer has been given or has missed.
  [[nodiscard]] std::uint64_t position() const noexcept { return position_; }

  /// Sends what `ring` holds up to `end`, as far as the socket takes it: `blocked` when it takes no more now, `gone`
  /// when the observer has left or memory does not suffice for what it must be told.
  [[nodiscard]] Progress send_up_to(std::uint64_t end, wire::NotificationRing& ring) noexcept;

  /// Whether the event queue watches for room in the socket.
  bool is_waiting = false;

 private:
  void tell(wire::FrameKind kind, std::uint64_t serial, const PropertyValue& value) noexcept;
  [[nodiscard]] Progress send_current() noexcept;

  Descriptor socket_;
  uid_t user_;
  std::uint64_t position_;
  wire::SharedBytes current_;  // the frame that is being sent
  std::size_t sent_ = 0;       // how much of it is
  bool broken_ = false;
};

}  // namespace quorvel::platform::host
