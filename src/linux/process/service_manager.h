// The agreement with a service manager: sockets that it passes, and the message that the daemon serves.
#pragma once

#include "platform/descriptor.h"

namespace quorvel::platform::host {

/// True when the service manager passed a listening local stream socket. Main thread.
[[nodiscard]] bool has_passed_socket() noexcept;

/// That socket, not blocking and closed on exec, or an empty descriptor. Main thread, once.
[[nodiscard]] Descriptor take_passed_socket() noexcept;

}  // namespace quorvel::platform::host
