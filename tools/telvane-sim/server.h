// The simulator's socket and everybody connected to it, served by one thread that waits for nobody in particular.
#pragma once

#include <poll.h>

#include <list>
#include <vector>

#include "linux/base/local_socket.h"
#include "peer.h"
#include "sim_state.h"

namespace quorvel::tools {

class Server {
 public:
  explicit Server(platform::host::ListeningSocket listener) noexcept : listener_(std::move(listener)) {}

  /// Serves until `signals`, a signalfd, has something to read.
  void run(int signals);

 private:
  using Peers = std::list<Peer>;

  [[nodiscard]] std::vector<pollfd> interests(int signals) const;
  [[nodiscard]] int wait_milliseconds() const;
  void accept_all();
  [[nodiscard]] bool serve(Peer& peer, short events);
  [[nodiscard]] bool carry_out_calls(Peer& peer);
  [[nodiscard]] bool carry_out(Peer& peer, const wire::Frame& call);
  [[nodiscard]] bool start_notify(Peer& peer, const wire::Frame& call, const PropertyValue& argument);
  [[nodiscard]] bool answer(Peer& peer, const wire::Frame& call, const PropertyValue& value,
                            const std::string& refusal);
  void carry_on_jobs();
  [[nodiscard]] PropertyValue notify_result(const NotifyJob& job) const;
  void send_event(const std::string& name);
  void drop_the_slow();
  [[nodiscard]] bool observers_keep_up() const;

  platform::host::ListeningSocket listener_;
  SimState state_;
  Peers peers_;
  bool out_of_descriptors_ = false;
};

}  // namespace quorvel::tools
