// What can be known of a running daemon from outside: its sockets, its entries in /proc.
#pragma once

#include <sys/types.h>

#include <optional>
#include <string>
#include <string_view>

namespace quorvel::tools {

/// Who serves a socket of the device.
struct Server {
  enum class State { absent, refused, unreachable, serving };
  State state = State::absent;
  pid_t process = 0;   // 0 where it is not known, 1 where a service manager listens for one to come
  uid_t user = 0;      // who listens
  std::string reason;  // why nobody was reached
};

/// Connects to `service` (its socket's name without the extension) and leaves again.
[[nodiscard]] Server server_of(std::string_view service);

/// True for a telephony service that the daemon would believe: one of root, or of the service directory's owner.
[[nodiscard]] bool is_believed(const Server& service);

/// A user's name, or the number of one without a name.
[[nodiscard]] std::string user_name(uid_t user);

/// True when the process that listened has ended, and another one, such as a service manager, keeps its socket.
[[nodiscard]] bool has_ended(const Server& server);

/// The name of a process's program, empty where /proc does not tell it.
[[nodiscard]] std::string program_of(pid_t process);

/// "quorveld, process 12 of user mobile", without the name where /proc does not tell it.
[[nodiscard]] std::string name_of(const Server& server);

/// When a process started, in whole seconds since 1970; nothing where /proc does not tell.
[[nodiscard]] std::optional<double> start_of(pid_t process);

/// Whether the daemon holds a connection of its own making, which it has to nobody but the telephony service; nothing
/// where the caller may not look.
[[nodiscard]] std::optional<bool> follows_telephony(pid_t daemon);

}  // namespace quorvel::tools
