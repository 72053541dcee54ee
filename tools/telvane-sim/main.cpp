#include <sys/signalfd.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <charconv>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <system_error>

#include "common/command_words.h"
#include "common/completion.h"
#include "common/failure.h"
#include "common/help_text.h"
#include "common/human_text.h"
#include "common/recording.h"
#include "common/root_option.h"
#include "common/words.h"
#include "platform/process.h"
#include "replay.h"
#include "sim_state.h"
#include "telephony-service/listener.h"
#include "telephony-service/server.h"

namespace quorvel::tools {
namespace {

// As sysexits.h has them.
constexpr int kUsage = 64;
constexpr int kNoInput = 66;
constexpr int kServiceUnavailable = 69;
constexpr int kSystemError = 71;
constexpr int kConfiguration = 78;

constexpr const char* kWords =
    "Serve as the telephony service of a machine without a modem\n\n"
    "Serves /run/quorvel/telvane.sock in the device root, in the foreground, until SIGTERM or SIGINT. It starts "
    "without "
    "a SIM and with every query answering nothing; quorvelctl sim changes that.\n\n"
    "Exit status: 0 stopped by a signal; 64 the words of the call are off; 66 the recording cannot be played; 69 "
    "another one serves the socket; 71 the "
    "socket cannot be had; 78 the device root names no directory.";

constexpr const char* kExamples =
    "  telvane-sim --root /tmp/device &\n"
    "  quorvelctl --root /tmp/device sim insert --iccid 8944501234567890123 \\\n"
    "    --imsi 234150999999999\n"
    "  telvane-sim --replay modem.jsonl --speed 10";

Descriptor open_signals() {
  std::signal(SIGPIPE, SIG_IGN);
  sigset_t set;
  sigemptyset(&set);
  sigaddset(&set, SIGTERM);
  sigaddset(&set, SIGINT);
  ::sigprocmask(SIG_BLOCK, &set, nullptr);
  return Descriptor(::signalfd(-1, &set, SFD_CLOEXEC | SFD_NONBLOCK));
}

platform::host::ListeningSocket open_listener() {
  try {
    return telephony::open_listener();
  } catch (const std::system_error& error) {
    if (error.code().value() == EADDRINUSE) {
      throw Failure{kServiceUnavailable, "a telephony service is running already on " + telephony::socket_path()};
    }
    throw Failure{kSystemError, std::string("cannot serve ") + error.what()};
  }
}

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
  const Descriptor signals = open_signals();
  if (!signals) throw Failure{kSystemError, std::string("cannot watch signals: ") + std::strerror(errno)};
  telephony::Server server(open_listener(), [&server](std::string_view command, const PropertyValue& argument) {
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
  throw Failure{kUsage, "--speed is \"" + word + "\", but takes a number from 0.001 to 1000000"};
}

int run(int count, char** words) {
  CLI::App app(kWords, "telvane-sim");
  app.formatter(std::make_shared<HelpFormatter>());
  app.footer(kExamples);
  std::string root;
  add_word(app, "--root", root, kRootHelp)->option_text("DIR");
  std::string file;
  std::string speed;
  add_word(app, "--replay", file, "Play what quorvelctl sim record wrote, beginning with the first observer")
      ->option_text("FILE");
  add_word(app, "--speed", speed, "Play N times as fast, such as 10 or 0.5")->option_text("N");
  app.set_version_flag("--version", "telvane-sim " QUORVEL_VERSION, "Print the version and end");
  if (const std::optional<std::string> answer = answer_for_tools(app, count, words, {})) {
    std::fputs(answer->c_str(), stdout);
    return 0;
  }
  try {
    app.parse(marked_words(count, words));
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() == 0) return app.exit(error);
    throw Failure{kUsage, complaint(app, error)};
  }
  Replay replay(file.empty() ? std::vector<RecordedStep>() : read_recording(file, kNoInput),
                speed.empty() ? 1 : speed_of(speed));
  use_device_root(app.count("--root") > 0 ? std::optional(root) : std::nullopt, kConfiguration);
  serve(std::move(replay));
  return 0;
}

}  // namespace
}  // namespace quorvel::tools

int main(int count, char** words) {
  try {
    return quorvel::tools::run(count, words);
  } catch (const quorvel::tools::Failure& failure) {
    std::fprintf(stderr, "telvane-sim: %s\n", quorvel::tools::displayable(failure.message).c_str());
    return failure.status;
  } catch (const std::bad_alloc&) {
    std::fputs("telvane-sim: memory does not suffice\n", stderr);
    return quorvel::tools::kSystemError;
  } catch (const std::exception& failure) {
    std::fprintf(stderr, "telvane-sim: %s\n", failure.what());
    return quorvel::tools::kSystemError;
  }
}
