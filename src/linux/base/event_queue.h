// The descriptors that a thread waits for, and the bell that wakes it from other threads.
#pragma once

#include <sys/epoll.h>

#include <cstdint>
#include <span>

#include "platform/descriptor.h"

namespace quorvel::platform::host {

class EventQueue {
 public:
  /// Makes the queue, with or without a bell. False with errno set; the queue is then as it was.
  [[nodiscard]] bool open() noexcept;
  [[nodiscard]] bool open_with_bell() noexcept;

  /// Waits for `events` (of epoll) on `descriptor` from now on; each carries `context`. False with errno set.
  [[nodiscard]] bool add(int descriptor, std::uint32_t events, void* context) const noexcept;
  /// Waits for other events on it. False with errno set.
  [[nodiscard]] bool change(int descriptor, std::uint32_t events, void* context) const noexcept;
  void remove(int descriptor) const noexcept;

  /// Fills `events` with what has become ready, after `milliseconds` at the latest (-1: whenever something does).
  /// Returns how many there are, 0 when time is up, -1 with errno set.
  [[nodiscard]] int wait(std::span<epoll_event> events, int milliseconds) const noexcept;

  /// Wakes the thread that waits. Any thread, once the queue is open.
  void ring() const noexcept;
  /// True for the event that `ring` brings, which comes until the bell is silenced.
  [[nodiscard]] bool is_bell(const epoll_event& event) const noexcept { return event.data.ptr == &bell_; }
  void silence() const noexcept;

 private:
  Descriptor epoll_;
  Descriptor bell_;
};

}  // namespace quorvel::platform::host
