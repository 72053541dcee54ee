#include "bridge/life.h"

#include <fstream>

namespace quorvel::test {
namespace {

std::string text_of(const char* baseband, const Traces& traces) {
  std::string text;
  for (const std::string& line : traces.lines) text += std::string(baseband) + ": " + line + "\n";
  return text + baseband + " posts " + std::to_string(traces.posted) + "\n";
}

std::vector<std::string> lines_of(const std::string& path) {
  std::vector<std::string> lines;
  std::ifstream file(path);
  for (std::string line; std::getline(file, line);) lines.push_back(line);
  return lines;
}

}  // namespace

std::vector<Step> written_life() {
  std::vector<Step> steps;
  for (const std::string& line : lines_of(QUORVEL_LIFE "/log")) {
    if (line.starts_with("# ")) steps.push_back({line.substr(2), {}, {}});
    Traces& traces = line.starts_with("older") ? steps.back().older : steps.back().newer;
    if (line.find(": ") == 5) traces.lines.push_back(line.substr(7));
    if (line.find(" posts ") == 5) traces.posted = std::stoi(line.substr(12));
  }
  return steps;
}

std::string text_of(const Step& step) {
  return "# " + step.name + "\n" + text_of("older", step.older) + text_of("newer", step.newer);
}

std::vector<std::string> steps_recorded(const std::string& path) {
  constexpr const char* kTime = ",\"time\"";
  std::vector<std::string> steps = lines_of(path);
  // A line that is still being written is none yet.
  std::erase_if(steps, [](const std::string& step) { return step.find(kTime) == std::string::npos; });
  for (std::string& step : steps) step.erase(step.rfind(kTime));
  return steps;
}

Device::Device(Baseband baseband) {
  const char cells[] = {static_cast<char>(baseband), 0, 0, 0};
  root.write_file("/etc/quorvel/telephony", "");
  root.write_file("/sys/firmware/devicetree/base/baseband/class", std::string_view(cells, sizeof cells));
}

std::vector<std::pair<std::string, std::string>> Device::environment() const {
  return {{"QUORVEL_ROOT", root.path().string()}};
}

void Device::serve(const std::string& program, std::vector<std::string> arguments) {
  service.emplace(program,
                  ProgramOptions{.arguments = std::move(arguments), .input = {}, .environment = environment()});
  ASSERT_TRUE(service->wait_until_ready());
}

// Its own start is no part of the life.
void Device::start_daemon() {
  daemon.emplace(daemon_program(), ProgramOptions{.arguments = {}, .input = {}, .environment = environment()});
  ASSERT_TRUE(daemon->wait_until_ready());
  ASSERT_TRUE(root.wait_for_log("registerForTelvaneCallNotifications: now listening for Telvane notifications"));
  std::vector<std::string> lines = root.log_lines();
  const auto start = std::find(lines.begin(), lines.end(),
                               "registerForTelvaneCallNotifications: now listening for Telvane notifications");
  seen_ = {{start + (start == lines.end() ? 0 : 1), lines.end()}, 0};
  monitor.emplace(control_program(),
                  ProgramOptions{.arguments = {"monitor", "--json"}, .input = {}, .environment = environment()});
  ASSERT_TRUE(eventually([&] { return monitor->err().find("listening") != std::string::npos; }));
  posted_before_ = 0;
}

int Device::posted() const {
  const std::string out = monitor->out();
  int count = 0;
  for (std::size_t at = 0; (at = out.find("\"sequence\"", at)) != std::string::npos; ++at) ++count;
  return count;
}

Traces Device::traces(const Traces& expected) {
  static_cast<void>(eventually([&] {
    for (std::string& line : root.log_lines()) seen_.lines.push_back(std::move(line));
    seen_.posted = posted() - posted_before_;
    return seen_.lines.size() >= expected.lines.size() && seen_.posted >= expected.posted;
  }));
  posted_before_ += seen_.posted;
  return std::exchange(seen_, {});
}

}  // namespace quorvel::test
