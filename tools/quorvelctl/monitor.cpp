#include <fnmatch.h>

#include <chrono>
#include <cstdio>
#include <memory>
#include <thread>

#include "client_failure.h"
#include "commands.h"
#include "common/date_text.h"
#include "common/human_text.h"
#include "common/json.h"
#include "output.h"
#include "quorvel/observer.h"

namespace quorvel::tools {
namespace {

using namespace std::chrono_literals;

constexpr auto kRetryInterval = 200ms;

struct MonitorWords {
  std::string name;
  std::string count;
};

std::string json_line(const client::Event& event, double time) {
  PropertyValue line = PropertyValue::dictionary(4);
  put(line, "time", PropertyValue::date(time));
  put(line, "sequence", PropertyValue::unsigned_integer(event.sequence));
  if (event.missed > 0) {
    put(line, "missed", PropertyValue::unsigned_integer(event.missed));
  } else {
    put(line, "name", PropertyValue::string(event.name));
    if (event.object) put(line, "object", event.object);
  }
  return to_json(line, -1) + '\n';
}

std::string human_line(const client::Event& event, double time) {
  const Palette& colours = palette();
  std::string line(colours.quiet);
  line.append(one_line(PropertyValue::date(time))).append(colours.reset).append("  ");
  if (event.missed > 0) {
    return line + "missed " + std::to_string(event.missed) + " notifications, the last one #" +
           std::to_string(event.sequence) + '\n';
  }
  line.append(colours.strong).append("#" + std::to_string(event.sequence)).append(colours.reset).append("  ");
  line.append(colours.key).append(displayable(event.name)).append(colours.reset);
  const bool says_more = event.object && event.object.text() != event.name;
  if (says_more) line += "  " + one_line(event.object);
  return line + '\n';
}

// Connects anew to a daemon that went away, however long that takes.
void connect_again(client::Observer& observer) {
  note("the daemon is gone; waiting for it to come back");
  while (const auto error = observer.connect()) {
    const bool comes_back = error->code == client::ErrorCode::service_absent ||
                            error->code == client::ErrorCode::disconnected ||
                            error->code == client::ErrorCode::timed_out;
    if (!comes_back) throw unreachable(*error, "the notification center", "quorveld");
    std::this_thread::sleep_for(kRetryInterval);
  }
  note("listening again, after #" + std::to_string(observer.first_sequence()));
}

int run_monitor(const MonitorWords& words, bool json) {
  const bool bounded = !words.count.empty();
  std::int64_t left = bounded ? number_of_word(words.count, "--count", 1, INT64_MAX) : 0;
  end_when_interrupted();
  client::Observer observer;
  if (const auto error = observer.connect()) throw unreachable(*error, "the notification center", "quorveld");
  note("listening for notifications after #" + std::to_string(observer.first_sequence()) + "; Ctrl-C ends it");
  while (!bounded || left > 0) {
    client::Event event;
    if (observer.next(event, -1ms)) {
      connect_again(observer);
      continue;
    }
    const bool wanted = words.name.empty() || ::fnmatch(words.name.c_str(), event.name.c_str(), 0) == 0;
    if (event.missed == 0 && !wanted) continue;
    const double time = seconds_now();
    write_output(json ? json_line(event, time) : human_line(event, time));
    if (event.missed == 0) --left;
  }
  return kDone;
}

}  // namespace

void add_monitor(CLI::App& app, CommandLine& line) {
  CLI::App& command = add_command(
      app, {"monitor", "Print each posted notification as it arrives",
            "  quorvelctl monitor\n"
            "  quorvelctl monitor --count 1 --name 'com.example.*'\n"
            "  quorvelctl monitor --json | jq -r .name",
            "Goes on until it is interrupted, also when the daemon ends and is started again. A reader that "
            "is too slow is told how many notifications it missed."});
  auto words = std::make_shared<MonitorWords>();
  add_option(command, "--name", words->name, "PATTERN",
             "Only notifications of this name, in which * and ? stand for others");
  add_option(command, "--count", words->count, "N", "End after N notifications");
  when_chosen(command, [&line, words] { line.run = [&line, words] { return run_monitor(*words, line.json); }; });
}

}  // namespace quorvel::tools
