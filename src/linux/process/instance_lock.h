#pragma once

namespace quorvel::platform::host {

/// Makes the service directory if it is missing and takes the lock that only one daemon in a device root can hold; it
/// is held until the process ends. Returns 0, or after one line on standard error the exit status to end with: 69 when
/// another daemon holds it, 71 when it cannot be had, 77 when this is root and the directory, or the state's home, is
/// another user's.
[[nodiscard]] int take_instance_lock() noexcept;

}  // namespace quorvel::platform::host
