// How many connections may be open at once. What the limit on descriptors leaves after a reserve for files, telephony
// and the daemon's own is divided between clients and observers, so that neither can use up the other's share.
#pragma once

#include <cstddef>

namespace quorvel::platform::host {

/// Both follow the process's present limit on descriptors, are at least 1, and together at most 4,096. Any thread.
[[nodiscard]] std::size_t client_connection_limit() noexcept;
[[nodiscard]] std::size_t observer_connection_limit() noexcept;

/// True for an error of accept(2) that lasts until descriptors or memory are free again.
[[nodiscard]] bool is_exhaustion(int error) noexcept;

}  // namespace quorvel::platform::host
