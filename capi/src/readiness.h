// One descriptor that becomes readable whenever something that proceeds by steps is due for the next.
#pragma once

#include "client/core/failure.h"
#include "client/core/wait.h"
#include "platform/descriptor.h"

namespace quorvel::capi {

class Readiness {
 public:
  /// Makes the descriptor. False after setting `failure`.
  [[nodiscard]] bool open(client::Failure& failure) noexcept;

  /// Has the descriptor become readable as `wait` says. The wait's own descriptor, once there is one, stays the same
  /// and open. False after setting `failure`.
  [[nodiscard]] bool follow(const client::Wait& wait, client::Failure& failure) noexcept;

  [[nodiscard]] int descriptor() const noexcept { return epoll_.get(); }

 private:
  [[nodiscard]] bool follow_events(const client::Wait& wait) noexcept;
  [[nodiscard]] bool follow_time(client::Moment until) noexcept;

  Descriptor epoll_;
  Descriptor timer_;
  short events_ = 0;
  client::Moment until_ = client::kNever;
};

}  // namespace quorvel::capi
