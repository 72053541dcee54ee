// The telephony service's socket and everybody connected to it. One thread serves them all and waits for nobody in
// particular: its owner polls, and tells the server what became ready.
#pragma once

#include <poll.h>

#include <functional>
#include <list>
#include <span>
#include <string>
#include <vector>

#include "linux/base/local_socket.h"
#include "linux/base/places.h"
#include "telephony-service/peer.h"
#include "telephony-service/state_frames.h"

namespace quorvel::telephony {

class Server {
 public:
  /// Decides about a command other than `show`: returns why it is refused, or an empty text after carrying it out. Of
  /// `notify` the server carries out the rest.
  using Command = std::function<std::string(std::string_view name, const PropertyValue& argument)>;

  Server(platform::host::ListeningSocket listener, Command command);

  /// The state that observers are told, and that `show` answers.
  [[nodiscard]] StateFrames& state() noexcept { return frames_; }

  /// Sends the notification `name` with the state to every observer. From the first one on, an observer that connects
  /// is sent the catch-up events behind its first state.
  void send_event(const std::string& name);

  /// Adds what the server waits for behind the other waits of its owner's poll; how long that poll may last at most,
  /// -1 for as long as it likes; and serves what became ready, given those waits again.
  void add_waits(std::vector<pollfd>& waits) const;
  [[nodiscard]] int wait_milliseconds() const;
  void serve(std::span<const pollfd> waits);

  /// How many observe, and whether each of them has taken what it was sent, but for a bounded rest.
  [[nodiscard]] std::size_t observer_count() const;
  [[nodiscard]] bool observers_keep_up() const;

 private:
  void accept_all();
  void make_room();
  void introduce(Descriptor connection);
  [[nodiscard]] bool serve_peer(Peer& peer, short events);
  [[nodiscard]] bool carry_out_calls(Peer& peer);
  [[nodiscard]] bool carry_out(Peer& peer, const wire::Frame& call);
  [[nodiscard]] bool start_notify(Peer& peer, const wire::Frame& call, const PropertyValue& argument);
  [[nodiscard]] bool answer(Peer& peer, const wire::Frame& call, const PropertyValue& value,
                            const std::string& refusal);
  void carry_on_jobs();
  [[nodiscard]] PropertyValue notify_result(const NotifyJob& job) const;
  void drop_the_slow();

  platform::host::ListeningSocket listener_;
  Command command_;
  StateFrames frames_;
  platform::host::Places places_;
  std::list<Peer> peers_;
  bool has_told_ = false;  // an event was sent
  bool rests_ = false;     // nobody can be accepted for a moment
};

}  // namespace quorvel::telephony
