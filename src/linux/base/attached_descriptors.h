// Descriptors that a peer attaches to what it sends. Nobody here wants any, but the kernel closes them in the thread
// that receives or drops the message, and closing one can take as long as its owner wishes: hours, for a socket that
// lingers.
//
// Linux 6.16 and later refuse them when asked to. Where that is too late or the kernel older, no thread that serves
// receives or drops a message with any: it looks at what has come before it takes it, and leaves every closing to a
// thread of its own, in which the kernel waits for nobody's socket.
#pragma once

#include <sys/types.h>

#include <cstddef>
#include <span>

#include "platform/descriptor.h"

namespace quorvel::platform::host {

/// Has the kernel refuse attached descriptors on the listening socket `listener` and on what is accepted from it or,
/// where it cannot, has this process keep away from them from now on. Main thread.
void refuse_attached_descriptors(int listener) noexcept;
/// The same for a socket that has listened before, to which clients may have connected and attached some already.
void refuse_further_descriptors(int listener) noexcept;

/// Makes a connection that was just accepted ready for `receive_bytes`.
void prepare_to_receive(int connection) noexcept;

/// recv(2) without waiting. Where descriptors are attached to what has come, nothing is received: -1 with EPERM, and
/// the connection is of no more use. Any thread.
[[nodiscard]] ssize_t receive_bytes(int connection, std::span<std::byte> room) noexcept;

/// Closes a connection, or a listener, to which a peer may have sent what nobody has received. Any thread.
void close_connection(Descriptor connection) noexcept;

/// How many that were given to `close_connection` are not closed yet. Any thread.
[[nodiscard]] std::size_t closing_connections() noexcept;

}  // namespace quorvel::platform::host
