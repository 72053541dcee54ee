#include "linux/base/connection_limit.h"

#include <sys/resource.h>

#include <algorithm>
#include <cerrno>

namespace quorvel::platform::host {

namespace {

// Eight for files and telephony; the others are open throughout: standard descriptors, locks, logs, event queues.
constexpr rlim_t kReservedDescriptors = 32;
constexpr std::size_t kObserverShare = 4;  // one in four

// What each connection costs the kernel, an unread reply included, is memory of the device's.
constexpr rlim_t kMaximumConnections = 4096;

[[nodiscard]] std::size_t connection_limit() noexcept {
  rlimit limit;
  if (::getrlimit(RLIMIT_NOFILE, &limit) != 0 || limit.rlim_cur <= kReservedDescriptors) return 1;
  return static_cast<std::size_t>(std::min(limit.rlim_cur - kReservedDescriptors, kMaximumConnections));
}

}  // namespace

std::size_t client_connection_limit() noexcept {
  const std::size_t limit = connection_limit();
  return limit - limit / kObserverShare;
}

std::size_t observer_connection_limit() noexcept {
  return std::max<std::size_t>(connection_limit() / kObserverShare, 1);
}

bool is_exhaustion(int error) noexcept {
  return error == EMFILE || error == ENFILE || error == ENOMEM || error == ENOBUFS;
}

}  // namespace quorvel::platform::host
