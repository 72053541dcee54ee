#include <new>

#include "commands.h"
#include "common/root_option.h"
#include "common/words.h"
#include "output.h"

namespace quorvel::tools {
namespace {

constexpr const char* kFooter = R"(
Examples:
  quorvelctl root create /tmp/device           make a scratch device to play with
  quorvelctl --root /tmp/device log --follow   watch the daemon that runs there
  quorvelctl ark get ProductVersion --json     one value, for a program

As JSON, data is {"$data": "BASE64"} and a date is {"$date": "2026-01-31T12:00:00Z"}.
A real that is no number is {"$real": "nan"}, "inf" or "-inf". A dictionary whose
only key looks like one of these has one more $ in front of that key.

Exit status: 0 done; 1 there is no such value; 2 the words of the call are off;
3 the daemon, simulator or file cannot be reached or read.)";

void add_commands(CLI::App& app, CommandLine& line) {
  app.require_subcommand(1);
  app.fallthrough();
  app.set_version_flag("--version", QUORVEL_VERSION);
  app.footer(kFooter);
  app.get_formatter()->label("SUBCOMMAND", "COMMAND");
  app.get_formatter()->label("Subcommands", "Commands");
  app.add_flag("--json", line.json, "Print JSON for programs; plist write and sim set take it back");
  add_word(app, "--root", line.root,
           "Device root: the directory that stands for the device's / (default: QUORVEL_ROOT)")
      ->option_text("DIR");
  add_regulatory_images(app, line);
  add_ark(app, line);
  add_monitor(app, line);
  add_preferences(app, line);
  add_plist(app, line);
  add_root(app, line);
  add_log(app, line);
  add_sim(app, line);
}

// The innermost command that the words chose.
const CLI::App& chosen_command(const CLI::App& app) {
  const std::vector<CLI::App*> chosen = app.get_subcommands();
  return chosen.empty() ? app : chosen_command(*chosen.front());
}

std::string describe(const CLI::App& app, const CLI::ParseError& error) {
  std::string names;
  for (const CLI::App* command = &chosen_command(app); command != nullptr; command = command->get_parent()) {
    names = command->get_name() + (names.empty() ? "" : " ") + names;
  }
  const std::vector<std::string> surplus = app.remaining(true);
  const bool incomplete = surplus.empty() && chosen_command(app).get_require_subcommand_min() > 0;
  const std::string what = !surplus.empty() ? '"' + surplus.front() + "\" has no meaning here"
                           : incomplete     ? "a command is missing"
                                            : error.what();
  return what + ". See: " + names + " --help";
}

int parse_and_run(int count, char** words) {
  CLI::App app("Talks to quorveld, the device's property store, and to its simulated telephony service.", "quorvelctl");
  CommandLine line;
  add_commands(app, line);
  try {
    app.parse(marked_words(count, words));
  } catch (const CLI::ParseError& error) {
    if (error.get_exit_code() == 0) return app.exit(error);
    note(describe(app, error));
    return kWrongWords;
  }
  // An empty word, as of a variable that is not set, is no way to ask for the machine's own root.
  const bool chosen = app.count("--root") > 0;
  if (line.uses_root) use_device_root(chosen ? std::optional(line.root) : std::nullopt, kWrongWords);
  return line.run();
}

}  // namespace

CLI::App* add_command(CLI::App& parent, const std::string& name, const std::string& summary,
                      const std::string& examples) {
  CLI::App* command = parent.add_subcommand(name, summary);
  command->fallthrough();
  command->footer("\nOptions of every command: --json, --root DIR.\n\nExamples:\n" + examples);
  return command;
}

}  // namespace quorvel::tools

int main(int count, char** words) {
  try {
    return quorvel::tools::parse_and_run(count, words);
  } catch (const quorvel::tools::Failure& failure) {
    quorvel::tools::note(failure.message);
    return failure.status;
  } catch (const std::bad_alloc&) {
    quorvel::tools::note("memory does not suffice");
    return quorvel::tools::kUnreachable;
  }
}
