// The connection to the telephony service: frames that grow as their bytes arrive.
#pragma once

#include <cstddef>

#include "platform/descriptor.h"
#include "property/byte_buffer.h"
#include "wire/frame.h"

namespace quorvel::platform::host {

class TelephonyStream {
 public:
  enum class Result { frame, nothing, gone };

  /// Connects, without waiting. Only the owner of the service directory is taken for the service. False when it is not
  /// there.
  [[nodiscard]] bool connect() noexcept;
  void close() noexcept;
  [[nodiscard]] bool is_open() const noexcept { return static_cast<bool>(socket_); }
  [[nodiscard]] int descriptor() const noexcept { return socket_.get(); }

  /// The next frame, valid until the call after; reads at most once. `gone` when the service has left or sends what
  /// cannot be a frame.
  [[nodiscard]] Result next(wire::Frame& frame) noexcept;

 private:
  [[nodiscard]] Result take_frame(wire::Frame& frame) noexcept;
  [[nodiscard]] Result receive() noexcept;
  void drop_taken() noexcept;

  Descriptor socket_;
  ByteBuffer input_;
  std::size_t taken_ = 0;  // how much of the input has been handed out
};

}  // namespace quorvel::platform::host
