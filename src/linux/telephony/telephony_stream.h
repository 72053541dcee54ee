// The connection to the telephony service: frames that grow as their bytes arrive. Whatever keeps the daemon from its
// service is told on standard error. Main thread only.
#pragma once

#include <sys/types.h>

#include "platform/descriptor.h"
#include "wire/frame_input.h"

namespace quorvel::platform::host {

class TelephonyStream {
 public:
  enum class Result { frame, nothing, gone };
  /// `absent`: nothing will be there before the service directory changes. `barred`: what is there may not be used,
  /// which a change there will end. `busy`: trying again may help.
  enum class Connection { open, absent, barred, busy };

  /// True when something, whatever it is, stands at the place of the service's socket.
  [[nodiscard]] static bool has_place() noexcept;

  /// Connects, without waiting. Only root and the owner of the service directory are taken for the service.
  [[nodiscard]] Connection connect() noexcept;
  void close() noexcept;
  [[nodiscard]] bool is_open() const noexcept { return static_cast<bool>(socket_); }
  [[nodiscard]] int descriptor() const noexcept { return socket_.get(); }

  /// The next frame, valid until the call after; reads at most once. `gone` when the service has left or sends what
  /// cannot be a frame.
  [[nodiscard]] Result next(wire::Frame& frame) noexcept;

  /// Tells that the service sent `frame`, which holds no state.
  void tell_unusable(const wire::Frame& frame) const noexcept;

 private:
  [[nodiscard]] bool is_trusted(int directory, int socket) noexcept;
  [[nodiscard]] Result take_frame(wire::Frame& frame) noexcept;
  [[nodiscard]] bool receive() noexcept;

  Descriptor socket_;
  pid_t process_ = 0;  // who listens, for the texts
  uid_t user_ = 0;
  wire::FrameInput input_;
};

}  // namespace quorvel::platform::host
