// A connection to a service that sends one request and takes frames off what arrives, one step at a time. No step
// blocks, and no step does more than a bounded share of the work, whatever the service sends.
#pragma once

#include <cstdint>

#include "client/core/service_socket.h"
#include "wire/frame_input.h"

namespace quorvel::client {

/// What a step came to. After `failed` there are no further steps.
enum class Progress { waiting, done, failed };

class Connection {
 public:
  /// Gets ready to connect (see ServiceSocket::open), to send `request`, a whole frame or nothing, and to take frames
  /// whose body is at most `maximum_body`. False after setting `failure`.
  [[nodiscard]] bool open(const char* root, std::string_view service, ByteBuffer request, std::uint32_t maximum_body,
                          Failure& failure) noexcept;

  /// Takes the next step. `done`: `frame` is the next frame, whose name and payload stay valid until the next step.
  [[nodiscard]] Progress step(wire::Frame& frame, Failure& failure) noexcept;

  /// When the next step is due.
  [[nodiscard]] Wait wait() const noexcept;

 private:
  enum class State { connecting, sending, receiving };

  [[nodiscard]] Progress connect(Failure& failure) noexcept;
  [[nodiscard]] Progress send(Failure& failure) noexcept;
  [[nodiscard]] Progress receive(Failure& failure) noexcept;
  [[nodiscard]] Progress take_frame(wire::Frame& frame, Failure& failure) noexcept;

  ServiceSocket socket_;
  State state_ = State::connecting;
  Moment try_again_ = 0;
  ByteBuffer request_;
  std::size_t sent_ = 0;
  wire::FrameInput received_;
  bool frame_is_left_ =
      false;  // behind the frame that was handed out, there is a whole frame, or bytes that can be none
  std::uint32_t maximum_body_ = 0;
};

}  // namespace quorvel::client
