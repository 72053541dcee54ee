// Plays a recording of a telephony service to those who observe the simulator.
#pragma once

#include <chrono>
#include <optional>
#include <vector>

#include "common/recording.h"
#include "telephony-service/server.h"

namespace quorvel::tools {

class Replay {
 public:
  /// `speed`: how many seconds of the recording pass in one.
  Replay(std::vector<RecordedStep> steps, double speed) : steps_(std::move(steps)), speed_(speed) {}

  /// Plays what is due, as far as the observers keep up. The first state is there at once; time begins with the first
  /// observer. Throws Failure when a state cannot be sent.
  void play(telephony::Server& server);

  /// How long a wait may last until something is due; -1 for as long as it likes.
  [[nodiscard]] int wait_milliseconds(const telephony::Server& server) const;

 private:
  using Clock = std::chrono::steady_clock;

  [[nodiscard]] Clock::time_point due(const RecordedStep& step) const;

  std::vector<RecordedStep> steps_;
  double speed_;
  std::size_t next_ = 0;
  bool has_first_state_ = false;
  std::optional<Clock::time_point> begin_;
};

}  // namespace quorvel::tools
