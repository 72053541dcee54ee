// The commands below "sim": the words of a call, and how a command is added.
#pragma once

#include <memory>
#include <string>

#include "commands.h"

namespace quorvel::tools {

struct SimWords {
  std::string field, json, domain, code, name, iccid, imsi, file;
  std::string count = "1";
};

using Words = std::shared_ptr<SimWords>;
using Run = int (*)(const SimWords&, bool json);

/// Adds a command below `sim` that does what `run` does with the words.
CLI::App& add_sim_command(CLI::App& sim, CommandLine& line, const Words& words, const CommandWords& own, Run run);

/// "a, b or c" of names, with `last` before the last one.
template <typename Names>
std::string list_of(const Names& names, const std::string& last) {
  std::string list;
  for (std::size_t i = 0; i < std::size(names); ++i) {
    list += (i == 0 ? "" : i + 1 == std::size(names) ? last : ", ") + std::string(names[i]);
  }
  return list;
}

/// The commands that show and change the simulator's state, and those that send or record what it tells.
void add_state_commands(CLI::App& sim, CommandLine& line, const Words& words);
void add_event_commands(CLI::App& sim, CommandLine& line, const Words& words);

}  // namespace quorvel::tools
