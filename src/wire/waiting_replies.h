// Replies that wait for slow clients. Clients that wait for the same answer share one buffer.
#pragma once

#include "platform/lock.h"
#include "wire/shared_bytes.h"

namespace quorvel::wire {

class WaitingReplies {
 public:
  /// Takes over an encoded reply frame that has to wait. Gives the frame of another waiting client instead where all
  /// bytes behind the head are equal. Empty when memory runs out. Any thread.
  [[nodiscard]] SharedBytes keep(ByteBuffer& frame) noexcept;
  /// To be called when a client no longer waits and has let go of its bytes. Any thread.
  void forget_unused() noexcept;

 private:
  Lock lock_;
  SharedBytes latest_ QUORVEL_GUARDED_BY(lock_);
};

}  // namespace quorvel::wire
