// The start of the process: everything that must be settled before the daemon's first log line.
#pragma once

#include <string_view>

namespace quorvel::platform {

/// Settles the device root, signals, standard descriptors, the one-instance lock and the notification center. Returns
/// 0, or after one line on standard error the exit status to end with: 78 for a device root that is no directory, 69
/// when another instance runs, 71 when the machine refuses what is needed, 77 for root where the service directory or
/// the state's home is another user's. A live process that holds the socket of `service_name` counts as another
/// instance; an empty name stands for no service. Main thread, once, before anything else.
[[nodiscard]] int start_process(std::string_view service_name = {}) noexcept;

/// Tells the service manager, if there is one, that the daemon serves. Main thread.
void report_ready() noexcept;

/// Ends the process at once with `status`, after one line on standard error. Any thread.
[[noreturn]] void end_process(const char* reason, int status) noexcept;

}  // namespace quorvel::platform
