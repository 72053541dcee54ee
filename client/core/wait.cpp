#include "client/core/wait.h"

#include <poll.h>

#include <algorithm>

namespace quorvel::client {

void sleep_until_due(const Wait& wait, Moment deadline) noexcept {
  pollfd polled{wait.descriptor, wait.events, 0};
  const Moment end = std::min(wait.until, deadline);
  const Moment left = end == kNever ? kNever : std::max(end - moment_now(), Moment{0});
  const timespec patience{left / 1'000'000'000, left % 1'000'000'000};
  static_cast<void>(::ppoll(&polled, wait.descriptor < 0 ? 0 : 1, end == kNever ? nullptr : &patience, nullptr));
}

}  // namespace quorvel::client
