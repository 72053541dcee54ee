#include "help_text.h"

#include <algorithm>

#include "command_words.h"
#include "human_text.h"

namespace quorvel::tools {
namespace {

constexpr std::size_t kWidth = 80;
constexpr std::size_t kWidestName = 22;

using Rows = std::vector<std::pair<std::string, std::string>>;

void append_rows(const std::string& heading, const Rows& rows, std::string& help) {
  if (rows.empty()) return;
  std::size_t widest = 0;
  for (const auto& [name, sentence] : rows) widest = std::max(widest, name.size());
  const std::size_t indent = std::min(widest, kWidestName) + 4;
  help += '\n' + heading + ":\n";
  for (const auto& [name, sentence] : rows) {
    help += "  " + name;
    if (name.size() + 4 > indent) {
      help.append("\n").append(indent, ' ');
    } else {
      help.append(indent - name.size() - 2, ' ');
    }
    help += wrapped(sentence, indent, kWidth) + '\n';
  }
}

std::string names_of(const CLI::Option& option) {
  std::string names;
  for (const std::string& name : option.get_snames()) names += "-" + name + ", ";
  names += long_name(option);
  const std::string value = value_name(option);
  return value.empty() ? names : names + ' ' + value;
}

Rows rows_of(const std::vector<const CLI::Option*>& options) {
  Rows rows;
  for (const CLI::Option* option : options) {
    rows.emplace_back(option->get_positional() ? long_name(*option) : names_of(*option), option->get_description());
  }
  return rows;
}

const CLI::App& program_of(const CLI::App& command) {
  return command.get_parent() == nullptr ? command : program_of(*command.get_parent());
}

}  // namespace

std::string usage_of(const CLI::App& command) {
  std::string usage;
  const auto add = [&usage](const std::string& word, bool required) {
    usage.append(usage.empty() ? "" : " ").append(required ? word : '[' + word + ']');
  };
  for (const CLI::Option* option : options_of(command)) {
    const std::string value = value_name(*option);
    add(long_name(*option) + (value.empty() ? "" : ' ' + value), option->get_required());
  }
  if (!commands_of(command).empty()) add("COMMAND ...", true);
  for (const CLI::Option* word : positionals_of(command)) {
    add(long_name(*word) + (takes_many(*word) ? "..." : ""), word->get_required());
  }
  return usage;
}

std::string HelpFormatter::make_help(const CLI::App* app, std::string, CLI::AppFormatMode) const {
  const std::string start = "Usage: " + full_name(*app) + ' ';
  std::string help = summary_of(*app) + ".\n\n" + start;
  help += wrapped(usage_of(*app), start.size(), kWidth) + '\n';
  if (const std::string about = about_of(*app); !about.empty()) {
    help += '\n' + wrapped(about, 0, kWidth) + '\n';
  }
  Rows commands;
  for (const CLI::App* command : commands_of(*app)) commands.emplace_back(command->get_name(), summary_of(*command));
  append_rows("Commands", commands, help);
  append_rows("Arguments", rows_of(positionals_of(*app)), help);
  Rows options = rows_of(options_of(*app));
  Rows common = app->get_parent() == nullptr ? Rows{} : rows_of(options_of(program_of(*app)));
  std::erase_if(common, [](const auto& row) { return row.first == "--version"; });
  Rows& last = app->get_parent() == nullptr ? options : common;
  last.emplace_back("-h, --help", "Print this help and end");
  append_rows("Options", options, help);
  append_rows("Options of every command", common, help);
  const std::string examples = app->get_footer();
  return examples.empty() ? help : help + "\nExamples:\n" + examples + '\n';
}

}  // namespace quorvel::tools
