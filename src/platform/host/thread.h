#pragma once

#include <pthread.h>

namespace quorvel::platform::host {

/// Starts a thread with a stack of fixed size. Returns 0 or an error number. The caller joins the thread.
[[nodiscard]] int start_thread(pthread_t& thread, const char* name, void* (*run)(void*), void* argument) noexcept;

}  // namespace quorvel::platform::host
