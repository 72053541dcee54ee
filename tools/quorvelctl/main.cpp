#include <csignal>
#include <memory>
#include <new>
#include <optional>

#include "commands.h"
#include "common/command_words.h"
#include "common/help_text.h"
#include "common/root_option.h"
#include "common/words.h"
#include "output.h"

namespace quorvel::tools {
namespace {

constexpr const char* kAbout =
    "Values for people come as text; with --json, output is one JSON value (for monitor, log --follow and facts "
    "--watch one a line), "
    "and plist write and sim set take it back. As JSON, data is {\"$data\": \"BASE64\"} and a date is {\"$date\": "
    "\"2026-01-31T12:00:00Z\"}. A real that is no number is {\"$real\": \"nan\"}, \"inf\" or \"-inf\". A dictionary "
    "whose only key looks like one of these has one more $ in front of that key.\n\n"
    "Exit status: 0 done; 1 there is no such value; 2 the words of the call are off; 3 the daemon, simulator or file "
    "cannot be reached or read; 78 QUORVEL_ROOT names no directory. Everything but the value asked for goes to "
    "standard "
    "error.";

constexpr const char* kExamples =
    "  quorvelctl root create /tmp/device           make a scratch device\n"
    "  quorvelctl --root /tmp/device log --follow   watch the daemon that runs there\n"
    "  quorvelctl ark get ProductVersion --json     one value, for a program";

void add_commands(CLI::App& app, CommandLine& line) {
  app.name("quorvelctl");
  app.formatter(std::make_shared<HelpFormatter>());
  app.footer(kExamples);
  app.require_subcommand(1);
  app.fallthrough();
  add_option(app, "--root", line.root, "DIR", kRootHelp);
  add_switch(app, "--json", line.json, "Print JSON, for programs");
  app.set_version_flag("--version", "quorvelctl " QUORVEL_VERSION, "Print the version and end");
  add_status(app, line);
  add_regulatory_images(app, line);
  add_facts(app, line);
  add_ark(app, line);
  add_monitor(app, line);
  add_preferences(app, line);
  add_plist(app, line);
  add_root(app, line);
  add_log(app, line);
  add_sim(app, line);
}

int parse_and_run(int count, char** words) {
  CLI::App app(std::string("Talk to the device's property store, quorveld, and to its telephony service\n\n") + kAbout);
  CommandLine line;
  add_commands(app, line);
  if (const std::optional<std::string> answer = answer_for_tools(app, count, words, candidates)) {
    write_output(*answer);
    return kDone;
  }
  try {
    app.parse(marked_words(count, words));
  } catch (const CLI::CallForHelp&) {
    write_output(chosen_command(app).help());
    return kDone;
  } catch (const CLI::CallForVersion&) {
    write_output("quorvelctl " QUORVEL_VERSION "\n");
    return kDone;
  } catch (const CLI::ParseError& error) {
    throw Failure{kWrongWords, complaint(app, error)};
  }
  // An empty word, as of a variable that is not set, is no way to ask for the machine's own root.
  const bool chosen = is_given(app, "--root");
  if (line.uses_root) use_device_root(chosen ? std::optional(line.root) : std::nullopt, kWrongWords);
  return line.run();
}

}  // namespace
}  // namespace quorvel::tools

int main(int count, char** words) {
  // A file that reaches its size limit is an error to be told, and what was written of it is removed.
  std::signal(SIGXFSZ, SIG_IGN);
  try {
    return quorvel::tools::parse_and_run(count, words);
  } catch (const quorvel::tools::Failure& failure) {
    quorvel::tools::note(failure.message);
    return failure.status;
  } catch (const std::bad_alloc&) {
    quorvel::tools::note("memory does not suffice");
    return quorvel::tools::kUnreachable;
  } catch (const std::exception& failure) {
    quorvel::tools::note(failure.what());
    return quorvel::tools::kUnreachable;
  }
}
