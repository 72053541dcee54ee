#pragma once

#include <pthread.h>

#include <cstdint>

namespace quorvel::platform::host {

/// Starts a thread with a stack of fixed size. Returns 0 or an error number. The caller joins the thread.
[[nodiscard]] int start_thread(pthread_t& thread, void* (*run)(void*), void* argument) noexcept;

/// Says that the process begins to end, from when its threads have half a second in all. Main thread, as below.
void begin_to_end() noexcept;
/// By when threads that were told to end must have ended, in milliseconds of the monotonic clock: half a second from
/// the beginning of the process's end, or where the process goes on, from now.
[[nodiscard]] std::int64_t end_of_patience() noexcept;

/// Waits for a thread's end, but not beyond `deadline`: a thread that waits for a hung disk, or for a descriptor that
/// does not close, may never come back. False when it has not ended: whatever it uses must be left to it.
[[nodiscard]] bool join_thread(pthread_t thread, std::int64_t deadline) noexcept;

/// Names the calling thread, for whoever looks at the process; at most 15 bytes. A thread names itself with one system
/// call, another one would have to write a file of the kernel's.
inline void name_this_thread(const char* name) noexcept { ::pthread_setname_np(::pthread_self(), name); }

}  // namespace quorvel::platform::host
