#include <charconv>
#include <cstdio>

#include "common/command_line.h"
#include "common/failure.h"
#include "common/recording.h"
#include "platform/process.h"
#include "replay.h"
#include "sim_state.h"
#include "telephony-service/program.h"
#include "telephony-service/server.h"

namespace quorvel::tools {
namespace {

const CommandWords kWords = {
    "telvane-sim", "Serve as the telephony service of a machine without a modem",
    "  telvane-sim --root /tmp/device &\n"
    "  quorvelctl --root /tmp/device sim insert --iccid 8944501234567890123 \\\n"
    "    --imsi 234150999999999\n"
    "  telvane-sim --replay modem.jsonl --speed 10",
    "Serves /run/quorvel/telvane.sock in the device root, in the foreground, until SIGTERM or SIGINT. It starts "
    "without a SIM and with every query answering nothing; quorvelctl sim changes that.\n\n"
    "Exit status: 0 stopped by a signal; 64 the words of the call are off; 66 the recording cannot be played; 69 "
    "another one serves the socket; 71 the socket cannot be had; 78 the device root names no directory."};

// The shorter of two waits, of which a negative one has no end.
int shorter(int left, int right) { return left < 0 || (right >= 0 && right < left) ? right : left; }

void serve_until(telephony::Server& server, Replay& replay, int signals) {
  for (;;) {
    std::vector<pollfd> waits = {{signals, POLLIN, 0}};
    server.add_waits(waits);
    const int wait = shorter(server.wait_milliseconds(), replay.wait_milliseconds(server));
    if (::poll(waits.data(), waits.size(), wait) < 0) continue;
    if (waits[0].revents != 0) return;
    server.serve(std::span(waits).subspan(1));
    replay.play(server);
  }
}

void serve(Replay replay) {
  const Descriptor signals = telephony::open_end_signals();
  telephony::Server server(telephony::claim_listener(),
                           [&server](std::string_view command, const PropertyValue& argument) {
                             return carry_out_command(server.state(), command, argument);
                           });
  replay.play(server);
  std::puts(server.state().value().size() > 0 ? "telvane-sim: ready to play" : "telvane-sim: ready, without a SIM");
  std::fflush(stdout);
  platform::report_ready();
  serve_until(server, replay, signals.get());
}

double speed_of(const std::string& word) {
  double speed = 0;
  const auto [end, failure] = std::from_chars(word.data(), word.data() + word.size(), speed);
  if (failure == std::errc{} && end == word.data() + word.size() && speed >= 0.001 && speed <= 1e6) return speed;
  throw Failure{telephony::kUsage, "--speed is \"" + word + "\", but takes a number from 0.001 to 1000000"};
}

int run(int count, char** words) {
  telephony::CallWords call(kWords);
  std::string file;
  std::string speed;
  add_option(call.app(), "--replay", file, "FILE",
             "Play what quorvelctl sim record wrote, beginning with the first observer");
  add_option(call.app(), "--speed", speed, "N", "Play N times as fast, such as 10 or 0.5");
  if (!call.take(count, words)) return 0;
  const double times = speed.empty() ? 1 : speed_of(speed);
  serve(Replay(file.empty() ? std::vector<RecordedStep>() : read_recording(file, telephony::kNoInput), times));
  return 0;
}

}  // namespace
}  // namespace quorvel::tools

int main(int count, char** words) {
  return quorvel::telephony::run_program("telvane-sim", quorvel::tools::run, count, words);
}
