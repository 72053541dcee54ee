// The main thread's run loop, on which the telephony service's deliveries arrive.
#pragma once

namespace quorvel::platform {

class RunLoop;

enum class RunLoopMode { default_mode };

/// The calling thread's run loop: the main run loop on the main thread, null on any other. Borrowed, lives for ever.
[[nodiscard]] RunLoop* current_run_loop() noexcept;
/// The main thread's run loop. Borrowed, lives for ever. Any thread.
[[nodiscard]] RunLoop* main_run_loop() noexcept;

/// Serves the main run loop's sources until SIGTERM or SIGINT ends it. Main thread, once.
void run_main_run_loop() noexcept;

}  // namespace quorvel::platform
