// The telephony service's socket, the same for every program that serves it.
#pragma once

#include <string>

#include "linux/base/local_socket.h"

namespace quorvel::telephony {

/// The socket that the service manager passed, once passed sockets are settled, or one made in the service directory,
/// whose missing directories are made. Mode 0600 and the directory's owner: the daemon's user. Throws
/// std::system_error; EADDRINUSE says that another service is running.
[[nodiscard]] platform::host::ListeningSocket open_listener();

/// The socket's path in the device root.
[[nodiscard]] std::string socket_path();

/// True when the process at the other end of `connection` is root's, this program's user's or the service directory
/// owner's.
[[nodiscard]] bool is_trusted(int connection) noexcept;

}  // namespace quorvel::telephony
