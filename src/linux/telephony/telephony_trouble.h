// Why the daemon is not following its telephony service, told on standard error. Main thread only.
#pragma once

#include <cstddef>
#include <cstdint>

namespace quorvel::platform::host {

enum class TelephonyTrouble : int { directory, connection, trust, loss, frame, state };

/// True when a trouble of this kind and detail (an error number, or whatever tells two of a kind apart) was not told
/// within the last minute, which the caller then does.
[[nodiscard]] bool should_tell(TelephonyTrouble trouble, int detail) noexcept;

}  // namespace quorvel::platform::host
