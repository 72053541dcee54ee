// One client of the IPC service. A connection belongs to one worker, whose thread alone uses it once it serves it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>

#include "linux/base/attached_descriptors.h"
#include "linux/base/intrusive_list.h"
#include "linux/base/places.h"
#include "platform/descriptor.h"
#include "platform/ipc.h"
#include "property/byte_buffer.h"
#include "wire/frame_input.h"
#include "wire/shared_bytes.h"
#include "wire/waiting_replies.h"

namespace quorvel::platform {

namespace host {
/// The longest body of a call: more than any operation has use for, and no more than what is read at once.
inline constexpr std::uint32_t kMaximumCallBody = 16u << 10;

/// What a connection borrows from its worker while a call of it runs.
struct IpcOutgoing {
  ByteBuffer frame;
  wire::WaitingReplies* waiting = nullptr;
  bool was_large = false;  // the reply that was encoded from a value
};
}  // namespace host

class IpcConnection : public host::ListLink {
 public:
  /// What the worker waits for (ipc_stages.h).
  enum class Stage : std::uint8_t { fresh, idle, partial, ready, sending, closed };

  explicit IpcConnection(Descriptor socket) noexcept
      : socket_(std::move(socket)), peer_(host::peer_of(socket_.get())) {}
  ~IpcConnection() { close(); }

  [[nodiscard]] int descriptor() const noexcept { return socket_.get(); }
  [[nodiscard]] const host::Peer& peer() const noexcept { return peer_; }
  void close() noexcept { host::close_connection(std::move(socket_)); }

  void set_interface(const IpcInterface* interface) noexcept { interface_ = interface; }
  void set_object(void* object) noexcept { object_ = object; }
  void set_resumed() noexcept { resumed_ = true; }
  [[nodiscard]] bool is_resumed() const noexcept { return resumed_; }

  /// Runs the call that `frame` holds and sends its reply as far as the socket takes it.
  void run_call(const wire::Frame& frame, host::IpcOutgoing& outgoing) noexcept;
  /// Sends a reply from within `run_call`.
  void reply(std::uint64_t serial, const PropertyValue& value, const IpcError* error) noexcept;
  void reply(std::uint64_t serial, const CheckedBytes& value) noexcept;
  /// Sends more of the reply that waits.
  void continue_sending() noexcept;
  [[nodiscard]] bool has_waiting_reply() const noexcept { return static_cast<bool>(waiting_); }
  /// True when the connection cannot go on: the client is gone, or memory did not suffice.
  [[nodiscard]] bool is_broken() const noexcept { return broken_; }

  /// The worker's notes.
  Stage stage = Stage::fresh;
  bool input_ended = false;  // the client sends nothing more
  bool has_called = false;
  std::uint32_t interest = 0;
  std::int64_t since = 0;  // when the stage began
  wire::FrameInput input;
  wire::Frame call = {};        // taken off the input, for `ready` to run; lies in it
  std::size_t noted_input = 0;  // how much of the input is noted with the user's place

 private:
  void finish_reply(bool complete) noexcept;
  void transmit(ByteBuffer& frame) noexcept;

  Descriptor socket_;
  host::Peer peer_;
  const IpcInterface* interface_ = nullptr;
  void* object_ = nullptr;
  bool resumed_ = false;
  bool broken_ = false;
  host::IpcOutgoing* outgoing_ = nullptr;
  // The reply that waits: its own head, and a frame whose other bytes it may share with other connections.
  std::byte head_[wire::kFrameHeadSize];
  wire::SharedBytes waiting_;
  std::size_t sent_ = 0;
};

}  // namespace quorvel::platform
