// quorvel-modem-bridge: a telephony service on top of ModemManager.
#include <algorithm>
#include <chrono>
#include <cstdio>
#include <optional>

#include "bridge/facts.h"
#include "bridge/source.h"
#include "common/command_line.h"
#include "platform/process.h"
#include "telephony-service/listener.h"
#include "telephony-service/program.h"
#include "telephony-service/server.h"

namespace quorvel::bridge {
namespace {

constexpr const char* kName = "quorvel-modem-bridge";

const tools::CommandWords kWords = {
    kName, "Serve as the telephony service of a machine whose modem ModemManager drives",
    "  quorvel-modem-bridge\n"
    "  quorvel-modem-bridge --device /sys/devices/platform/soc/usb1/1-1\n"
    "  quorvelctl sim show",
    "Follows a modem of ModemManager's and serves /run/quorvel/telvane.sock, in the foreground, until SIGTERM or "
    "SIGINT. "
    "It reads, and never changes a modem. Each thing that it tells is a line on standard error.\n\n"
    "Exit status: 0 stopped by a signal; 64 the words of the call are off; 69 another telephony service is running; 71 "
    "the socket cannot be had; 78 the device root names no directory."};

void log_line(const std::string& text) { telephony::print_line(kName, text); }

class Bridge {
 public:
  Bridge(platform::host::ListeningSocket listener, Facts facts)
      : server_(std::move(listener),
                [](std::string_view, const PropertyValue&) { return "this telephony service follows a modem"; }),
        facts_(std::move(facts)) {
    // Whoever connects before the first reading sees errors, no modem that knows nothing.
    tell(facts_.take({Reach::bus_lost, {}, 0}, Clock::now()));
  }

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
    for (const std::string& line : telling.lines) log_line(line);
  }

  telephony::Server server_;
  Facts facts_;
  ModemManagerSource source_;
};

int run(int count, char** words) {
  telephony::CallWords call(kWords);
  std::string device;
  bool shows_identities = false;
  tools::add_option(call.app(), "--device", device, "DEVICE",
                    "Follow this modem only: its device, as mmcli -m any prints it");
  tools::add_switch(call.app(), "--show-identities", shows_identities,
                    "Write the identities of card and subscriber to the log in full, not their last four digits alone");
  if (!call.take(count, words)) return 0;
  const Descriptor signals = telephony::open_end_signals();
  auto listener = telephony::claim_listener();
  log_line("serving " + telephony::socket_path() + (device.empty() ? "" : ", for the modem " + device + " only"));
  Bridge bridge(std::move(listener), Facts(device, shows_identities));
  platform::report_ready();
  bridge.serve_until(signals.get());
  return 0;
}

}  // namespace
}  // namespace quorvel::bridge

int main(int count, char** words) {
  return quorvel::telephony::run_program(quorvel::bridge::kName, quorvel::bridge::run, count, words);
}
