// The agreement with a service manager: sockets that it passes, and what it is told.
#pragma once

#include <string_view>

#include "platform/descriptor.h"

namespace quorvel::platform::host {

/// Finds out which sockets the service manager passed. To be called before anything is opened, whose number would
/// otherwise be taken for one that was passed. Says on standard error, in a sentence for each kind of trouble, which of
/// them are of no use. Main thread, once.
void settle_passed_sockets() noexcept;

/// True when the service manager passed a listening local stream socket. Main thread.
[[nodiscard]] bool has_passed_socket() noexcept;

/// That socket, not blocking and closed on exec, or an empty descriptor. Main thread, once.
[[nodiscard]] Descriptor take_passed_socket() noexcept;

/// Tells the service manager, if there is one, in one line what the daemon does; it is shown to whoever asks for the
/// service's status, until the next text replaces it. About 240 bytes are shown, a line break ends the text. A
/// manager that is behind with its messages misses it. Main thread.
void report_status(std::string_view text) noexcept;

}  // namespace quorvel::platform::host
