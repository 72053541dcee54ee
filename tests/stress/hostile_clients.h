// A crowd of clients that no service wants.
#pragma once

#include "support/socket_peer.h"

namespace quorvel::test {

class HostileClients {
 public:
  /// Stops and disconnects everybody.
  ~HostileClients();

  /// These stay connected: silent, with half a call sent, or with a large reply asked for that they never read.
  void add_idle(std::size_t count);
  void add_half_calls(std::size_t count);
  void add_never_reading(std::size_t count);
  /// Waits until the reply to each of those that never read has begun to arrive; how many it has.
  [[nodiscard]] std::size_t wait_for_replies();

  /// Has each of those that never read take one byte after all.
  void trickle();

  /// Each starts a thread. One that sends calls by the hundred without waiting for replies; one that connects again and
  /// again, sends what no service should be sent, or a call, and leaves.
  void add_flooding();
  void add_reconnecting();

  [[nodiscard]] std::size_t held() const { return held_.size(); }
  /// Ends one of those that stay connected: the first, or the last.
  void drop_last() { held_.pop_back(); }
  [[nodiscard]] long flood_replies() const { return flood_replies_; }
  [[nodiscard]] long reconnections() const { return reconnections_; }

 private:
  SocketPeer& hold();
  void flood();
  void reconnect();

  std::vector<SocketPeer> held_;
  std::vector<int> never_reading_;
  std::atomic<bool> stopping_ = false;
  std::atomic<long> flood_replies_ = 0;
  std::atomic<long> reconnections_ = 0;
  std::vector<std::thread> threads_;
};

}  // namespace quorvel::test
