// A connection that carries frames, with a deadline on every wait.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "service_socket.h"
#include "wire/frame.h"

namespace quorvel::client {

class Channel {
 public:
  explicit Channel(Descriptor connection) noexcept : connection_(std::move(connection)) {}

  /// Sends all of `bytes`. Returns why not, or nothing.
  [[nodiscard]] std::optional<Error> send(std::span<const std::byte> bytes, Deadline deadline);

  /// Waits for the next frame, whose name and payload stay valid until the next call. Returns why there is none, or
  /// nothing. What has arrived of a frame is kept when the deadline passes.
  [[nodiscard]] std::optional<Error> receive(wire::Frame& frame, std::uint32_t maximum_body, Deadline deadline);

 private:
  [[nodiscard]] std::optional<Error> receive_bytes(Deadline deadline);

  Descriptor connection_;
  ByteBuffer received_;
  std::size_t taken_ = 0;  // bytes of `received_` that belong to frames handed out
};

}  // namespace quorvel::client
