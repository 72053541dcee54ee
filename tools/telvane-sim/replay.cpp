#include "replay.h"

#include <algorithm>
#include <cstdio>

#include "common/failure.h"

namespace quorvel::tools {
namespace {

constexpr int kStepsPerTurn = 1000;
constexpr std::chrono::milliseconds kLongestWait = std::chrono::hours(1);

void take_state(telephony::Server& server, const RecordedStep& step) {
  if (!server.state().replace(step.state)) {
    throw Failure{kUnreachable, "a state of the recording is too large or too deep to be sent"};
  }
}

}  // namespace

Replay::Clock::time_point Replay::due(const RecordedStep& step) const {
  // A pause of years is as good as one of a day: it is cut, so that the clock's range suffices.
  constexpr double kLongestPause = 86'400.0 * 365;
  const double seconds = std::min((step.time - steps_.front().time) / speed_, kLongestPause);
  return *begin_ + std::chrono::duration_cast<Clock::duration>(std::chrono::duration<double>(seconds));
}

void Replay::play(telephony::Server& server) {
  if (!has_first_state_ && !steps_.empty()) take_state(server, steps_.front());
  has_first_state_ = true;
  if (!begin_ && server.observer_count() > 0) begin_ = Clock::now();
  if (!begin_) return;
  for (int i = 0; i < kStepsPerTurn && next_ < steps_.size() && due(steps_[next_]) <= Clock::now(); ++i) {
    if (!server.observers_keep_up()) return;
    const RecordedStep& step = steps_[next_++];
    take_state(server, step);
    if (!step.event.empty()) server.send_event(step.event);
    if (next_ < steps_.size()) continue;
    std::printf("telvane-sim: played %zu steps\n", steps_.size());
    std::fflush(stdout);
  }
}

int Replay::wait_milliseconds(const telephony::Server& server) const {
  if (!begin_ || next_ == steps_.size() || !server.observers_keep_up()) return -1;
  const auto left = std::chrono::ceil<std::chrono::milliseconds>(due(steps_[next_]) - Clock::now());
  return static_cast<int>(std::clamp(left, std::chrono::milliseconds(0), kLongestWait).count());
}

}  // namespace quorvel::tools
