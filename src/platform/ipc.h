// The IPC service: a listener registered under a service name, whose connections export an object under an interface.
// Accept callbacks and operations run on the service's own threads, several at once.
#pragma once

#include <sys/types.h>

#include <cstdint>
#include <span>
#include <string_view>

#include "property/value.h"

namespace quorvel {
class CheckedBytes;
}

namespace quorvel::platform {

/// The error that a reply carries.
struct IpcError {
  std::int32_t code;
  std::string_view description;
};

/// The codes of failures that no operation of its own has: there is none of the called name; the argument is not what
/// the operation takes. A telephony service refuses commands with the second.
inline constexpr std::int32_t kUnknownOperation = 1;
inline constexpr std::int32_t kRefusedArgument = 2;

class IpcConnection;
class IpcListener;

/// The caller of an operation: the user and the process that connected, as the kernel knew them then. A user of -1 is
/// not known.
struct IpcCaller {
  uid_t user = static_cast<uid_t>(-1);
  pid_t process = 0;
};

/// The reply to a call. It lasts as long as the operation runs and can neither be kept nor be handed on, so that
/// nothing can be sent to a connection that is gone by then. Empty when the client wants no reply. A call that the
/// operation does not answer stays unanswered.
class IpcReply {
 public:
  explicit IpcReply(IpcConnection* connection = nullptr, std::uint64_t serial = 0) noexcept
      : connection_(connection), serial_(serial) {}
  IpcReply(const IpcReply&) = delete;
  IpcReply& operator=(const IpcReply&) = delete;
  [[nodiscard]] explicit operator bool() const noexcept { return connection_ != nullptr; }
  /// Sends a value (or none) and an error (or null); further calls do nothing. The connection is closed
  /// when memory runs out. On the thread that runs the operation.
  void send(const PropertyValue& value, const IpcError* error) noexcept;
  /// The same for a value whose checked bytes are at hand.
  void send(const CheckedBytes& value) noexcept;

 private:
  IpcConnection* connection_;
  std::uint64_t serial_;
};

/// The call that an operation answers.
struct IpcCall {
  const PropertyValue& argument;  ///< none when the call has none
  IpcCaller caller;
};

/// One operation of an interface.
struct IpcOperation {
  std::string_view name;
  void (*invoke)(void* object, const IpcCall& call, IpcReply& reply) noexcept;
};

struct IpcInterface {
  std::string_view name;
  std::span<const IpcOperation> operations;
};

/// For the delegate, to be called for a connection that it accepts. The connection belongs to the service.
void set_exported_interface(IpcConnection* connection, const IpcInterface* interface) noexcept;
void set_exported_object(IpcConnection* connection, void* object) noexcept;
void resume(IpcConnection* connection) noexcept;

struct IpcDelegate {
  void* object;
  /// Called for each new connection; the connection is closed when it returns false or has not resumed it.
  bool (*accept)(void* object, IpcListener* listener, IpcConnection* connection) noexcept;
};

/// A listener for a service name, or null when memory runs out. The caller owns it and gives it back with
/// `release_listener`, which stops its threads and closes its connections; a thread that does not end within half a
/// second is left behind with the listener. Main thread.
[[nodiscard]] IpcListener* create_listener(std::string_view service_name) noexcept;
void set_delegate(IpcListener* listener, IpcDelegate delegate) noexcept;
/// Starts accepting. Returns 0; or after one line on standard error the exit status to end with: 69 when a live
/// process holds the service's socket, 71 when the socket or the threads cannot be had.
[[nodiscard]] int resume(IpcListener* listener) noexcept;
void release_listener(IpcListener* listener) noexcept;

}  // namespace quorvel::platform
