// Reaches a service's socket inside a device root.
#pragma once

#include <chrono>
#include <optional>
#include <string>

#include "platform/descriptor.h"
#include "quorvel/client.h"

namespace quorvel::client {

/// When a wait ends; `kNever` for one without end.
using Deadline = std::chrono::steady_clock::time_point;
inline constexpr Deadline kNever = Deadline::max();
[[nodiscard]] Deadline deadline_after(std::chrono::milliseconds timeout) noexcept;

/// Waits until `descriptor` is ready for one of the poll(2) `events`. False when the deadline passes first.
[[nodiscard]] bool wait_until_ready(int descriptor, short events, Deadline deadline) noexcept;

/// Connects to `socket` (a file name) in the services' directory of the device root; the result does not block. Empty
/// after setting `error`.
[[nodiscard]] Descriptor connect_to_service(const std::string& root, const std::string& socket, Deadline deadline,
                                            std::optional<Error>& error);

}  // namespace quorvel::client
