// A listening socket in a thread's event queue. While descriptors or memory have run out it cannot be accepted from but
// stays readable, which would keep the thread awake: it then rests until a connection closes or some time has passed.
#pragma once

#include <sys/epoll.h>

#include <cstdint>
#include <limits>

#include "linux/base/event_queue.h"

namespace quorvel::platform::host {

class RestingListener {
 public:
  /// Has `queue` wait for `events` on the listening `socket` from now on. Queue and socket stay the caller's.
  void open(const EventQueue& queue, int socket, std::uint32_t events) noexcept;
  /// Ends the waiting for good.
  void close() noexcept;

  /// True for an event that says that somebody has connected.
  [[nodiscard]] bool is_event(const epoll_event& event) const noexcept { return event.data.ptr == this; }

  /// Whoever connected next, a socket that does not block. Empty with errno set: EAGAIN when nobody is left; with any
  /// other error the listener rests.
  [[nodiscard]] Descriptor accept() noexcept;

  void rest() noexcept;
  /// Rests for a moment only: places that are missing will be free as soon as others have had their turn.
  void rest_briefly() noexcept;
  [[nodiscard]] bool is_resting() const noexcept { return rests_until_ != kNever; }
  /// Says that a connection was closed: the rest ends at the next `wake_when_due`.
  void end_rest() noexcept;
  /// Listens again when it is time.
  void wake_when_due(std::int64_t now) noexcept;
  /// When that is, in milliseconds of the monotonic clock; the largest number while the listener does not rest.
  [[nodiscard]] std::int64_t due() const noexcept { return rests_until_; }

 private:
  static constexpr std::int64_t kNever = std::numeric_limits<std::int64_t>::max();

  void listen() noexcept;
  void rest_for(std::int64_t milliseconds) noexcept;

  const EventQueue* queue_ = nullptr;
  int socket_ = -1;
  std::uint32_t events_ = 0;
  std::int64_t rests_until_ = kNever;
};

}  // namespace quorvel::platform::host
