#pragma once

namespace quorvel {

/// Brings the daemon up, serves until SIGTERM or SIGINT, and returns the process's exit status: 0, or after one line on
/// standard error why it could not start (platform/process.h, platform/ipc.h). Main thread, once.
[[nodiscard]] int run_daemon() noexcept;

}  // namespace quorvel
