#include "command_words.h"

#include "words.h"

namespace quorvel::tools {
namespace {

constexpr const char* kAboutMark = "\n\n";

const CLI::Option* missing_word(const CLI::App& command) {
  for (const CLI::Option* option : command.get_options()) {
    if (option->get_required() && option->count() == 0) return option;
  }
  return nullptr;
}

std::string reason(const CLI::App& app, const CLI::ParseError& error) {
  const CLI::App& command = chosen_command(app);
  const std::vector<std::string> surplus = app.remaining(true);
  const std::string what = error.what();
  if (dynamic_cast<const CLI::ArgumentMismatch*>(&error) != nullptr) {
    const bool missing = what.find("missing") != std::string::npos;
    return what.substr(0, what.find(':')) + (missing ? " needs a value behind it" : " is given more than once");
  }
  if (!surplus.empty()) {
    // A mark in front of a value is no part of what was typed.
    const std::string word = surplus.front().substr(surplus.front().starts_with(kMark) ? 1 : 0);
    if (word.starts_with('-')) return '"' + word + "\" is no option here";
    return '"' + word + (command.get_require_subcommand_min() > 0 ? "\" is no command" : "\" has no meaning here");
  }
  if (command.get_require_subcommand_min() > 0) return "a command is missing";
  if (const CLI::Option* missing = missing_word(command)) return long_name(*missing) + " is missing";
  return "an option that is a switch takes no such value";
}

}  // namespace

std::string description_of(const CommandWords& words) {
  return words.about.empty() ? words.summary : words.summary + kAboutMark + words.about;
}

const CLI::App& chosen_command(const CLI::App& app) {
  const std::vector<CLI::App*> chosen = app.get_subcommands();
  return chosen.empty() ? app : chosen_command(*chosen.front());
}

std::string summary_of(const CLI::App& command) {
  const std::string description = command.get_description();
  return description.substr(0, description.find(kAboutMark));
}

std::string about_of(const CLI::App& command) {
  const std::string description = command.get_description();
  const std::size_t mark = description.find(kAboutMark);
  return mark == std::string::npos ? "" : description.substr(mark + 2);
}

std::string full_name(const CLI::App& command) {
  const CLI::App* parent = command.get_parent();
  return (parent == nullptr ? "" : full_name(*parent) + ' ') + command.get_name();
}

std::vector<const CLI::App*> commands_of(const CLI::App& command) {
  return command.get_subcommands([](const CLI::App*) { return true; });
}

std::vector<const CLI::Option*> positionals_of(const CLI::App& command) {
  return command.get_options([](const CLI::Option* option) { return option->get_positional(); });
}

std::vector<const CLI::Option*> options_of(const CLI::App& command) {
  return command.get_options(
      [&command](const CLI::Option* option) { return !option->get_positional() && option != command.get_help_ptr(); });
}

std::string value_name(const CLI::Option& option) {
  return option.get_positional() ? option.get_name(true) : option.get_option_text();
}

std::string long_name(const CLI::Option& option) {
  if (option.get_positional()) return option.get_name(true);
  return option.get_lnames().empty() ? "-" + option.get_snames().front() : "--" + option.get_lnames().front();
}

std::string complaint(const CLI::App& app, const CLI::ParseError& error) {
  return reason(app, error) + ". See: " + full_name(chosen_command(app)) + " --help";
}

}  // namespace quorvel::tools
