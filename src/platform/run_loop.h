// The main thread's run loop, on which the telephony service's deliveries arrive.
#pragma once

namespace quorvel::platform {

class RunLoop;

enum class RunLoopMode { default_mode };

/// The calling thread's run loop, null where it has none; the main thread's run loop. Borrowed, live for ever. The
/// current run loop is asked for by the main thread only.
[[nodiscard]] RunLoop* current_run_loop() noexcept;
[[nodiscard]] RunLoop* main_run_loop() noexcept;

/// Serves the main run loop's sources until SIGTERM or SIGINT ends it. Main thread, once.
void run_main_run_loop() noexcept;

}  // namespace quorvel::platform
