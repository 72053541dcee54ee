// The other end of the daemon's sockets, frame by frame.
#pragma once

#include "platform/descriptor.h"
#include "support/watching.h"
#include "wire/frame_input.h"

namespace quorvel::test {

struct ReceivedFrame {
  wire::FrameKind kind;
  std::uint64_t serial;
  std::string name;
  PropertyValue value;
};

/// The bytes of a frame.
[[nodiscard]] std::string frame_bytes(wire::FrameKind kind, std::uint64_t serial, std::string_view name,
                                      const PropertyValue& value = nullptr, std::uint8_t flags = 0);

class SocketPeer {
 public:
  explicit SocketPeer(Descriptor socket) : socket_(std::move(socket)) {}
  /// Connected to a socket in the service directory.
  [[nodiscard]] static SocketPeer connected_to(std::string_view name);

  [[nodiscard]] explicit operator bool() const { return static_cast<bool>(socket_); }
  [[nodiscard]] int descriptor() const { return socket_.get(); }
  /// Sends all of `bytes`; false when the other end does not take them.
  bool send(std::string_view bytes);
  void end_sending();
  /// The next frame; none when the other end has closed or nothing comes.
  [[nodiscard]] std::optional<ReceivedFrame> receive(std::chrono::milliseconds patience = kPatience);
  /// True when the other end closes the connection without sending another byte.
  [[nodiscard]] bool is_closed(std::chrono::milliseconds patience = kPatience);

 private:
  [[nodiscard]] bool read_more(std::chrono::milliseconds patience);

  Descriptor socket_;
  wire::FrameInput input_;
};

/// A listening socket in the service directory, for playing a service.
[[nodiscard]] Descriptor listen_on(std::string_view name);
/// The next client of `listener`; empty when none comes.
[[nodiscard]] SocketPeer accept_from(const Descriptor& listener, std::chrono::milliseconds patience = kPatience);

/// Sends `bytes` with descriptors attached, without waiting; what `sendmsg` returns.
ssize_t send_attached(int socket, std::string_view bytes, std::span<const int> attached);

/// A service that sends each of so many clients, one after the other, what it is told to, in pieces, and keeps the
/// connection open if asked.
class FakeService {
 public:
  FakeService(std::string_view name, std::vector<std::string> pieces, bool hold, int clients = 1);
  ~FakeService() { thread_.join(); }

 private:
  Descriptor listener_;
  std::thread thread_;
};

}  // namespace quorvel::test
