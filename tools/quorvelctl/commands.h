// The commands of quorvelctl. Each function adds one command to the parser; a command that the words of a call choose
// leaves what it is to do in `CommandLine::run`.
#pragma once

#include <functional>
#include <string>

#include "common/command_line.h"
#include "common/completion.h"
#include "common/failure.h"

namespace quorvel::tools {

struct CommandLine {
  bool json = false;
  std::string root;
  /// False for a command on ordinary paths, for which the device root need not be there.
  bool uses_root = true;
  /// Does the work and returns the exit status, or throws Failure.
  std::function<int()> run;
};

void add_regulatory_images(CLI::App& app, CommandLine& line);
void add_status(CLI::App& app, CommandLine& line);
void add_facts(CLI::App& app, CommandLine& line);
void add_ark(CLI::App& app, CommandLine& line);
void add_monitor(CLI::App& app, CommandLine& line);
void add_preferences(CLI::App& app, CommandLine& line);
void add_plist(CLI::App& app, CommandLine& line);
void add_root(CLI::App& app, CommandLine& line);
void add_log(CLI::App& app, CommandLine& line);
void add_sim(CLI::App& app, CommandLine& line);

/// Known domains, keys, fields and names for an unfinished call.
[[nodiscard]] std::vector<Candidate> candidates(const UnfinishedCall& call);

}  // namespace quorvel::tools
