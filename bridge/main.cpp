// quorvel-modem-bridge: a telephony service on top of ModemManager.
#include <sys/signalfd.h>

#include <CLI/CLI.hpp>
#include <algorithm>
#include <cerrno>
#include <csignal>
#include <cstdio>
#include <cstring>
#include <system_error>

#include "bridge/facts.h"
#include "bridge/source.h"
#include "common/failure.h"
#include "common/human_text.h"
#include "common/root_option.h"
#include "platform/process.h"
#include "telephony-service/listener.h"
#include "telephony-service/server.h"

namespace quorvel::bridge {
namespace {

// As sysexits.h has them.
constexpr int kUsage = 64;
constexpr int kServiceUnavailable = 69;
constexpr int kSystemError = 71;
constexpr int kConfiguration = 78;

constexpr const char* kFooter = R"(
Follows the modem that ModemManager found and serves /run/quorvel/telvane.sock,
in the foreground, until SIGTERM or SIGINT. It never changes a modem.

Examples:
  quorvel-modem-bridge
  quorvel-modem-bridge --device /sys/devices/platform/soc/usb1/1-1

Exit status: 0 stopped by a signal; 64 the words of the call are off; 69 another
telephony service is running; 71 the socket cannot be had; 78 the device root
names no directory.)";

using tools::Failure;

void log_line(const std::string& text) {
  std::fprintf(stderr, "quorvel-modem-bridge: %s\n", tools::displayable(text).c_str());
}

Descriptor open_signals() {
  std::signal(SIGPIPE, SIG_IGN);
  std::signal(SIGHUP, SIG_IGN);
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

class Bridge {
 public:
  Bridge(platform::host::ListeningSocket listener, Facts facts)
      : server_(std::move(listener),
                [](std::string_view, const PropertyValue&) { return "this telephony service follows a modem"; }),
        facts_(std::move(facts)) {}

  void serve_until(int signals) {
    for (;;) {
      std::vector<pollfd> waits = {{signals, POLLIN, 0}, source_.wait()};
      server_.add_waits(waits);
      if (::poll(waits.data(), waits.size(), wait_milliseconds()) < 0) continue;
      if (waits[0].revents != 0) return;
      server_.serve(std::span(waits).subspan(2));
      follow();
    }
  }

 private:
  using Clock = Facts::Clock;

  [[nodiscard]] int wait_milliseconds() const {
    const auto now = Clock::now();
    auto wait = std::chrono::milliseconds(server_.wait_milliseconds());
    for (const auto& deadline : {source_.deadline(), facts_.deadline()}) {
      if (!deadline) continue;
      const auto left = std::clamp(std::chrono::ceil<std::chrono::milliseconds>(*deadline - now),
                                   std::chrono::milliseconds(0), std::chrono::milliseconds(std::chrono::hours(1)));
      wait = wait.count() < 0 ? left : std::min(wait, left);
    }
    return static_cast<int>(wait.count());
  }

  void follow() {
    std::optional<Reading> reading = source_.serve();
    if (const std::string trouble = source_.take_trouble(); !trouble.empty()) log_line(trouble);
    if (reading) {
      tell(facts_.take(*std::move(reading), Clock::now()));
    } else if (facts_.deadline() && *facts_.deadline() <= Clock::now()) {
      tell(facts_.take_again(Clock::now()));
    }
  }

  void tell(const Telling& telling) {
    if (telling.state && !server_.state().replace(telling.state)) return log_line("the state cannot be sent");
    for (const std::string& event : telling.events) server_.send_event(event);
    if (!telling.line.empty()) log_line(telling.line);
  }

  telephony::Server server_;
  Facts facts_;
  ModemManagerSource source_;
};

int run(int count, char** words) {
  CLI::App app("Serve as the telephony service of a machine whose modem ModemManager drives", "quorvel-modem-bridge");
  std::string root;
  std::string device;
  bool shows_identities = false;
  app.footer(kFooter);
  app.set_version_flag("--version", "quorvel-modem-bridge " QUORVEL_VERSION, "Print the version and end");
  app.add_option("--device", device, "Follow this modem only: its physical device, as mmcli prints it")
      ->type_name("")
      ->option_text("DEVICE");
  app.add_flag("--show-identities", shows_identities, "Write card and subscriber identities to the log in full");
  app.add_option("--root", root, "Device root: the directory that stands for the device's / (default: QUORVEL_ROOT)")
      ->type_name("")
      ->option_text("DIR");
  try {
    app.parse(count, words);
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() == 0) return app.exit(error);
    throw Failure{kUsage, std::string(error.what()) + ". See: quorvel-modem-bridge --help"};
  }
  tools::use_device_root(app.count("--root") > 0 ? std::optional(root) : std::nullopt, kConfiguration);
  const Descriptor signals = open_signals();
  if (!signals) throw Failure{kSystemError, std::string("cannot watch signals: ") + std::strerror(errno)};
  Bridge bridge(open_listener(), Facts(device, shows_identities));
  log_line("serving " + telephony::socket_path() + (device.empty() ? "" : ", for the modem " + device + " only"));
  platform::report_ready();
  bridge.serve_until(signals.get());
  return 0;
}

}  // namespace
}  // namespace quorvel::bridge

int main(int count, char** words) {
  try {
    return quorvel::bridge::run(count, words);
  } catch (const quorvel::tools::Failure& failure) {
    quorvel::bridge::log_line(failure.message);
    return failure.status;
  } catch (const std::bad_alloc&) {
    std::fputs("quorvel-modem-bridge: memory does not suffice\n", stderr);
    return quorvel::bridge::kSystemError;
  }
}
