#include <algorithm>
#include <chrono>
#include <deque>
#include <memory>
#include <thread>
#include <utility>

#include "commands.h"
#include "common/human_text.h"
#include "common/json.h"
#include "files.h"
#include "log_files.h"
#include "output.h"
#include "platform/device_paths.h"

namespace quorvel::tools {
namespace {

using namespace std::chrono_literals;

constexpr auto kFollowInterval = 100ms;

struct LogWords {
  bool follow = false;
  std::string count;
};

// Prints lines as text, or as JSON texts: one array, or one text a line while following.
class Printer {
 public:
  Printer(bool json, bool follow) : json_(json), follow_(follow) {
    if (json_ && !follow_) write_output("[");
  }

  void print(const std::deque<std::string>& lines) {
    std::string text;
    for (const std::string& line : lines) {
      if (json_ && !follow_) text += first_ ? "\n  " : ",\n  ";
      text += json_ ? json_string(line) : displayable(line);
      if (!json_ || follow_) text += '\n';
      first_ = false;
    }
    write_output(text);
  }

  void finish() const {
    if (json_ && !follow_) write_output(first_ ? "]\n" : "\n]\n");
  }

 private:
  bool json_;
  bool follow_;
  bool first_ = true;
};

// Cuts bytes into lines and keeps the line that is not whole yet.
class Lines {
 public:
  void add(const std::string& bytes, std::deque<std::string>& lines) {
    for (std::size_t start = 0; start < bytes.size();) {
      const std::size_t end = std::min(bytes.find('\n', start), bytes.size());
      open_.append(bytes, start, end - start);
      if (end < bytes.size()) lines.push_back(std::exchange(open_, {}));
      start = end + 1;
    }
  }
  void end(std::deque<std::string>& lines) {
    if (!open_.empty()) lines.push_back(std::exchange(open_, {}));
  }

 private:
  std::string open_;
};

// The log as it is now, or its last lines; a line that is not whole yet stays in `cutter`.
void print_present(LogFiles& files, Lines& cutter, const LogWords& words, Printer& printer) {
  const bool last_only = !words.count.empty();
  const std::size_t most = last_only ? static_cast<std::size_t>(number_of_word(words.count, "-n", 0, 1'000'000)) : 0;
  std::deque<std::string> lines;
  for (std::string bytes; !(bytes = files.read()).empty();) {
    cutter.add(bytes, lines);
    if (!last_only) printer.print(std::exchange(lines, {}));
    while (last_only && lines.size() > most) lines.pop_front();
  }
  if (!words.follow) cutter.end(lines);
  while (last_only && lines.size() > most) lines.pop_front();
  printer.print(lines);
}

int print_log(const LogWords& words, bool json) {
  LogFiles files;
  if (!files.open()) {
    if (!words.follow) {
      throw Failure{kUnreachable,
                    std::string("there is no log at ") + paths::kLogFile + ". " + how_to_start("quorveld")};
    }
    note("there is no log yet; waiting for one");
  }
  if (words.follow) end_when_interrupted();
  Printer printer(json, words.follow);
  Lines cutter;
  print_present(files, cutter, words, printer);
  while (words.follow) {
    const std::string bytes = files.read();
    if (bytes.empty()) {
      std::this_thread::sleep_for(kFollowInterval);
      continue;
    }
    std::deque<std::string> lines;
    cutter.add(bytes, lines);
    printer.print(lines);
  }
  printer.finish();
  return kDone;
}

}  // namespace

void add_log(CLI::App& app, CommandLine& line) {
  CLI::App& command = add_command(app, {"log", "Print the daemon's log, the previous generation first",
                                        "  quorvelctl log -n 20\n"
                                        "  quorvelctl log --follow -n 0"});
  auto words = std::make_shared<LogWords>();
  add_switch(command, "-f,--follow", words->follow, "Go on printing what is logged, until interrupted");
  add_option(command, "-n,--lines", words->count, "N", "Of what is there, print the last N lines only");
  when_chosen(command, [&line, words] { line.run = [&line, words] { return print_log(*words, line.json); }; });
}

}  // namespace quorvel::tools
