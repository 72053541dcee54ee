#include "command_line.h"

#include <utility>

#include "command_words.h"
#include "words.h"

namespace quorvel::tools {
namespace {

CLI::Option* add_text(CLI::App& command, const std::string& name, std::string& text, const std::string& help) {
  const auto take = [&text](const CLI::results_t& results) {
    text = results.front();
    if (text.starts_with(kMark)) text.erase(0, 1);
    return true;
  };
  return command.add_option(name, take, help)->type_name("");
}

}  // namespace

CLI::App& add_command(CLI::App& parent, const CommandWords& words) {
  CLI::App* command = parent.add_subcommand(words.name, description_of(words));
  command->fallthrough();
  command->footer(words.examples);
  return *command;
}

CLI::App& add_group(CLI::App& parent, const CommandWords& words) {
  CLI::App& group = add_command(parent, words);
  group.require_subcommand(1);
  return group;
}

void add_word(CLI::App& command, const std::string& name, std::string& word, const std::string& help) {
  add_text(command, name, word, help)->required();
}

void add_words(CLI::App& command, const std::string& name, std::vector<std::string>& words, const std::string& help) {
  command.add_option(name, words, help);
}

void add_option(CLI::App& command, const std::string& name, std::string& value, const std::string& value_name,
                const std::string& help, Need need) {
  add_text(command, name, value, help)->option_text(value_name)->required(need == Need::kRequired);
}

void add_switch(CLI::App& command, const std::string& name, bool& on, const std::string& help) {
  command.add_flag(name, on, help);
}

void when_chosen(CLI::App& command, std::function<void()> then) { command.callback(std::move(then)); }

bool is_given(const CLI::App& command, const std::string& option) { return command.count(option) > 0; }

}  // namespace quorvel::tools
