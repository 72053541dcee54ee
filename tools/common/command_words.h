// What a command line was made of, read back from its parser, and what is wrong with the words of a call.
//
// A command's description is its summary and what there is to say about it, if anything, behind an empty line. Its
// footer is its examples.
#pragma once

#include <CLI/CLI.hpp>
#include <string>
#include <vector>

#include "command_line.h"

namespace quorvel::tools {

/// Summary and more as one description, from which the next two take them.
[[nodiscard]] std::string description_of(const CommandWords& words);
[[nodiscard]] std::string summary_of(const CLI::App& command);
[[nodiscard]] std::string about_of(const CLI::App& command);

/// "quorvelctl ark get".
[[nodiscard]] std::string full_name(const CLI::App& command);

/// The innermost command that the words of a parsed call chose.
[[nodiscard]] const CLI::App& chosen_command(const CLI::App& app);

/// The commands below one, in the order in which they were added.
[[nodiscard]] std::vector<const CLI::App*> commands_of(const CLI::App& command);

/// A command's own words and options, without --help, in the order in which they were added.
[[nodiscard]] std::vector<const CLI::Option*> positionals_of(const CLI::App& command);
[[nodiscard]] std::vector<const CLI::Option*> options_of(const CLI::App& command);

/// Name of the value that a positional word is or that an option takes, such as DIR; empty for a switch.
[[nodiscard]] std::string value_name(const CLI::Option& option);
/// "--follow", or for a positional word its name.
[[nodiscard]] std::string long_name(const CLI::Option& option);

[[nodiscard]] inline bool takes_many(const CLI::Option& option) { return option.get_items_expected_max() > 1; }

/// One sentence about words that the parser refuses, which ends with the help to read.
[[nodiscard]] std::string complaint(const CLI::App& app, const CLI::ParseError& error);

}  // namespace quorvel::tools
