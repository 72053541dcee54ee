#include <chrono>
#include <cstdio>

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

constexpr auto kEpoch = std::chrono::sys_days{2001y / 1 / 1};

double seconds_now() {
  const auto now = std::chrono::time_point_cast<std::chrono::milliseconds>(std::chrono::system_clock::now());
  return std::chrono::duration<double>(now - kEpoch).count();
}

std::string json_line(const client::Event& event, double time) {
  PropertyValue line = PropertyValue::dictionary(4);
  bool built = line.set("time", PropertyValue::date(time)) &&
               line.set("sequence", PropertyValue::unsigned_integer(event.sequence));
  if (event.missed > 0) {
    built = built && line.set("missed", PropertyValue::unsigned_integer(event.missed));
  } else {
    built = built && line.set("name", PropertyValue::string(event.name));
    if (event.object) built = built && line.set("object", event.object);
  }
  if (!built) throw Failure{kUnreachable, "memory does not suffice"};
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
  return line.append(colours.key).append(one_line(PropertyValue::string(event.name))).append(colours.reset) + '\n';
}

int run_monitor(bool json) {
  end_when_interrupted();
  client::Observer observer;
  if (const auto error = observer.connect()) throw unreachable(*error, "the notification center", "quorveld");
  note("listening for notifications after #" + std::to_string(observer.first_sequence()) + "; Ctrl-C ends it");
  for (;;) {
    client::Event event;
    if (const auto error = observer.next(event, -1ms)) throw unreachable(*error, "the notification center", "quorveld");
    const double time = seconds_now();
    write_output(json ? json_line(event, time) : human_line(event, time));
  }
}

}  // namespace

void add_monitor(CLI::App& app, CommandLine& line) {
  CLI::App* command = add_command(app, {"monitor", "Print each posted notification as it arrives, until interrupted",
                                        "  quorvelctl monitor\n"
                                        "  quorvelctl monitor --json | jq -r .name"});
  command->callback([&line] { line.run = [&line] { return run_monitor(line.json); }; });
}

}  // namespace quorvel::tools
