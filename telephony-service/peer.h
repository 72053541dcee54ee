// One connection to a telephony service: an observer, or a person's command.
#pragma once

#include <chrono>
#include <cstdint>
#include <deque>
#include <optional>
#include <string>

#include "linux/base/attached_descriptors.h"
#include "linux/base/places.h"
#include "platform/descriptor.h"
#include "telephony-service/state_frames.h"
#include "wire/frame_input.h"

namespace quorvel::telephony {

/// A notification that a command asked for and that is not yet sent in full.
struct NotifyJob {
  std::string name;
  std::uint64_t left;
  std::uint64_t serial;
  bool wants_reply;
  std::uint64_t cut_off = 0;  // observers that did not read meanwhile
};

class Peer {
 public:
  using Clock = std::chrono::steady_clock;

  /// Takes one of `places`, which outlive the peer.
  Peer(Descriptor connection, platform::host::Places& places) noexcept
      : connection_(std::move(connection)),
        places_(places),
        user_(platform::host::peer_of(connection_.get()).user),
        has_place_(places.take(user_) != 0) {}

  Peer(const Peer&) = delete;
  Peer& operator=(const Peer&) = delete;
  ~Peer() {
    platform::host::close_connection(std::move(connection_));
    if (has_place_) places_.give_back(user_);
  }

  [[nodiscard]] int descriptor() const noexcept { return connection_.get(); }
  [[nodiscard]] uid_t user() const noexcept { return user_; }
  /// False when memory ran out: the peer cannot stay.
  [[nodiscard]] bool has_place() const noexcept { return has_place_; }

  /// Reads what has arrived. False when the connection is of no more use.
  [[nodiscard]] bool receive();
  /// The next call that has arrived in full, valid until the next `receive`. `refused` when the bytes are no call.
  [[nodiscard]] wire::FrameResult next_call(wire::Frame& frame) noexcept;

  /// Adds a frame to those to be sent, and sends as much as goes at once. False when the connection is broken.
  [[nodiscard]] bool send(SharedFrame frame);
  [[nodiscard]] bool flush();

  /// True when so much waits to be sent that nothing should be added.
  [[nodiscard]] bool is_behind() const noexcept { return waiting_bytes_ > kWaitingBound; }
  [[nodiscard]] bool has_waiting() const noexcept { return !waiting_.empty(); }
  /// When the frame that is being sent has had its time, which no byte renews; for a peer that something waits for.
  [[nodiscard]] Clock::time_point deadline() const noexcept { return frame_started_ + kPatience; }
  /// True when the other end sends nothing more.
  [[nodiscard]] bool ended() const noexcept { return ended_; }

  /// Set by the first call: from then on the peer is sent replies only.
  bool commands = false;
  std::optional<NotifyJob> job;

 private:
  static constexpr std::size_t kWaitingBound = 1u << 20;
  static constexpr auto kPatience = std::chrono::seconds(5);

  Descriptor connection_;
  platform::host::Places& places_;
  uid_t user_;
  bool has_place_;
  bool ended_ = false;
  wire::FrameInput received_;
  std::deque<SharedFrame> waiting_;
  std::size_t sent_of_first_ = 0;
  std::size_t waiting_bytes_ = 0;
  Clock::time_point frame_started_ = Clock::now();
};

}  // namespace quorvel::telephony
