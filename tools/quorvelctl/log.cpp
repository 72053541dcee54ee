#include <chrono>
#include <thread>

#include "commands.h"
#include "common/json.h"
#include "log_files.h"
#include "output.h"

namespace quorvel::tools {
namespace {

using namespace std::chrono_literals;

constexpr auto kFollowInterval = 100ms;

// Prints the log as it is, or its lines as JSON texts: one array, or one text a line while following.
class Printer {
 public:
  Printer(bool json, bool follow) : json_(json), follow_(follow) {
    if (json_ && !follow_) write_output("[");
  }

  void print(const std::string& bytes) {
    if (!json_) return write_output(bytes);
    std::string text;
    for (const char byte : bytes) {
      if (byte == '\n') {
        add_line(text);
      } else {
        line_ += byte;
      }
    }
    write_output(text);
  }

  void finish() {
    if (!json_) return;
    std::string text;
    if (!line_.empty()) add_line(text);
    write_output(text + (first_ ? "]\n" : "\n]\n"));
  }

 private:
  void add_line(std::string& text) {
    if (!follow_) text += first_ ? "\n  " : ",\n  ";
    text += json_string(line_);
    if (follow_) text += '\n';
    first_ = false;
    line_.clear();
  }

  bool json_;
  bool follow_;
  bool first_ = true;
  std::string line_;
};

int print_log(bool json, bool follow) {
  LogFiles files;
  if (!files.open()) {
    if (!follow) {
      throw Failure{kUnreachable,
                    "there is no log at /var/mobile/Library/Logs/quorveld.log. Start quorveld with the same "
                    "device root (--root, QUORVEL_ROOT), then try again"};
    }
    note("there is no log yet; waiting for one");
  }
  if (follow) end_when_interrupted();
  Printer printer(json, follow);
  for (;;) {
    const std::string bytes = files.read();
    if (!bytes.empty()) {
      printer.print(bytes);
    } else if (follow) {
      std::this_thread::sleep_for(kFollowInterval);
    } else {
      printer.finish();
      return kDone;
    }
  }
}

}  // namespace

void add_log(CLI::App& app, CommandLine& line) {
  CLI::App* command = add_command(app, {"log", "Print the daemon's log, the previous generation first",
                                        "  quorvelctl log | tail -n 20\n"
                                        "  quorvelctl log --follow"});
  auto follow = std::make_shared<bool>(false);
  command->add_flag("--follow,-f", *follow, "Go on printing what is logged, until interrupted");
  command->callback([&line, follow] { line.run = [&line, follow] { return print_log(line.json, *follow); }; });
}

}  // namespace quorvel::tools
