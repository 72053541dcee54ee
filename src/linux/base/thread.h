#pragma once

#include <pthread.h>

namespace quorvel::platform::host {

/// Starts a thread with a stack of fixed size. Returns 0 or an error number. The caller joins the thread.
[[nodiscard]] int start_thread(pthread_t& thread, void* (*run)(void*), void* argument) noexcept;

/// Names the calling thread, for whoever looks at the process; at most 15 bytes. A thread names itself with one system
/// call, another one would have to write a file of the kernel's.
inline void name_this_thread(const char* name) noexcept { ::pthread_setname_np(::pthread_self(), name); }

}  // namespace quorvel::platform::host
