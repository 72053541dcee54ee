// The newest notifications, encoded once, each under its sequence number. Whoever posts appends, and never waits for
// those who read; a reader that is too slow learns how many it missed.
#pragma once

#include <cstddef>
#include <cstdint>

#include "platform/lock.h"
#include "wire/shared_bytes.h"

namespace quorvel::wire {

class NotificationRing {
 public:
  /// What a reader meets behind its position.
  struct Step {
    SharedBytes frame;           // the next notification's; empty when `missed` is not 0 or nothing is there
    std::uint64_t missed = 0;    // how many notifications are gone
    std::uint64_t position = 0;  // the reader's position after the step
  };

  /// Adds a frame under the next sequence number, which it writes into the frame. An empty `frame` stands for a
  /// notification that could not be encoded, which every reader misses. Any thread.
  void append(ByteBuffer frame) noexcept;

  /// The newest sequence number, 0 when there is none. Any thread.
  [[nodiscard]] std::uint64_t newest() noexcept;

  /// What a reader at `position` meets next, up to and with `end`, a number that `newest` has given. Any thread.
  [[nodiscard]] Step step(std::uint64_t position, std::uint64_t end) noexcept;

  /// Lets go of everything up to and with `position`, which no reader needs any more. Any thread.
  void forget(std::uint64_t position) noexcept;

 private:
  static constexpr std::size_t kCapacity = 1024;

  [[nodiscard]] SharedBytes& slot(std::uint64_t sequence) noexcept QUORVEL_REQUIRES(lock_) {
    return slots_[sequence % kCapacity];
  }

  Lock lock_;
  std::uint64_t newest_ QUORVEL_GUARDED_BY(lock_) = 0;
  std::uint64_t forgotten_ QUORVEL_GUARDED_BY(lock_) = 0;  // everything up to here is gone
  SharedBytes slots_[kCapacity] QUORVEL_GUARDED_BY(lock_);
};

}  // namespace quorvel::wire
