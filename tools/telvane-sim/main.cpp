#include <sys/signalfd.h>

#include <CLI/CLI.hpp>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <system_error>

#include "common/command_words.h"
#include "common/completion.h"
#include "common/failure.h"
#include "common/help_text.h"
#include "common/human_text.h"
#include "common/root_option.h"
#include "common/words.h"
#include "platform/process.h"
#include "sim_state.h"
#include "telephony-service/listener.h"
#include "telephony-service/server.h"

namespace quorvel::tools {
namespace {

// As sysexits.h has them.
constexpr int kUsage = 64;
constexpr int kServiceUnavailable = 69;
constexpr int kSystemError = 71;
constexpr int kConfiguration = 78;

constexpr const char* kWords =
    "Serve as the telephony service of a machine without a modem\n\n"
    "Serves /run/quorvel/telvane.sock in the device root, in the foreground, until SIGTERM or SIGINT. It starts "
    "without "
    "a SIM and with every query answering nothing; quorvelctl sim changes that.\n\n"
    "Exit status: 0 stopped by a signal; 64 the words of the call are off; 69 another one serves the socket; 71 the "
    "socket cannot be had; 78 the device root names no directory.";

constexpr const char* kExamples =
    "  telvane-sim --root /tmp/device &\n"
    "  quorvelctl --root /tmp/device sim insert --iccid 8944501234567890123 \\\n"
    "    --imsi 234150999999999";

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

void serve_until(telephony::Server& server, int signals) {
  for (;;) {
    std::vector<pollfd> waits = {{signals, POLLIN, 0}};
    server.add_waits(waits);
    if (::poll(waits.data(), waits.size(), server.wait_milliseconds()) < 0) continue;
    if (waits[0].revents != 0) return;
    server.serve(std::span(waits).subspan(1));
  }
}

void serve() {
  const Descriptor signals = open_signals();
  if (!signals) throw Failure{kSystemError, std::string("cannot watch signals: ") + std::strerror(errno)};
  telephony::Server server(open_listener(), [&server](std::string_view command, const PropertyValue& argument) {
    return carry_out_command(server.state(), command, argument);
  });
  std::puts("telvane-sim: ready, without a SIM");
  std::fflush(stdout);
  platform::report_ready();
  serve_until(server, signals.get());
}

int run(int count, char** words) {
  CLI::App app(kWords, "telvane-sim");
  app.formatter(std::make_shared<HelpFormatter>());
  app.footer(kExamples);
  std::string root;
  add_word(app, "--root", root, kRootHelp)->option_text("DIR");
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
  use_device_root(app.count("--root") > 0 ? std::optional(root) : std::nullopt, kConfiguration);
  serve();
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
  }
}
