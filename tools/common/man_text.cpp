#include "command_words.h"
#include "help_text.h"

namespace quorvel::tools {
namespace {

constexpr std::size_t kWidth = 80;

// Text lines of the page: no line that reads as a macro, no escape, and each sentence on a line of its own.
std::string prose(const std::string& text) {
  std::string lines;
  std::size_t column = 0;
  for (std::size_t start = 0; start < text.size();) {
    const std::size_t end = std::min(text.find_first_of(" \n", start), text.size());
    std::string word;
    for (const char byte : text.substr(start, end - start)) word.append(byte == '\\' ? "\\e" : std::string(1, byte));
    const bool sentence = column > 0 && lines.ends_with('.');
    if (column > 0 && (sentence || column + 1 + word.size() > kWidth)) {
      lines += '\n';
      column = 0;
    }
    if (column > 0) ++column, lines += ' ';
    if (column == 0 && (word.starts_with('.') || word.starts_with('\''))) word.insert(0, "\\&");
    lines += word;
    column += word.size();
    const bool paragraph = text.compare(end, 2, "\n\n") == 0;
    if (paragraph) lines += "\n.Pp\n", column = 0;
    start = end + (paragraph ? 2 : 1);
  }
  return lines + (lines.ends_with('.') ? "\n" : ".\n");
}

// "Fl -domain Ar DOMAIN", "Fl -raw", "Ar KEY".
std::string macros_of(const CLI::Option& option) {
  std::string macros;
  if (option.get_positional()) return "Ar " + long_name(option) + (takes_many(option) ? " ..." : "");
  for (const std::string& name : option.get_snames()) macros += "Fl " + name + " , ";
  macros += "Fl " + long_name(option).substr(1);
  const std::string value = value_name(option);
  return value.empty() ? macros : macros + " Ar " + value;
}

std::string usage_macros(const CLI::App& command) {
  std::string macros;
  const auto add = [&macros](const CLI::Option& option) {
    const std::string own = macros_of(option);
    macros += option.get_required() ? ' ' + own : " Oo " + own + " Oc";
  };
  for (const CLI::Option* option : options_of(command)) add(*option);
  for (const CLI::Option* word : positionals_of(command)) add(*word);
  return macros;
}

void append_list(const std::vector<const CLI::Option*>& options, std::string& page) {
  if (options.empty()) return;
  page += ".Bl -tag -width Ds\n";
  for (const CLI::Option* option : options) {
    page += ".It " + macros_of(*option) + '\n' + prose(option->get_description());
  }
  page += ".El\n";
}

void append_command(const CLI::App& command, const std::string& names, std::string& page) {
  for (const CLI::App* below : commands_of(command)) append_command(*below, names + ' ' + below->get_name(), page);
  if (!commands_of(command).empty()) return;
  page += ".It Cm" + names + usage_macros(command) + '\n' + prose(summary_of(command));
  if (const std::string about = about_of(command); !about.empty()) page += prose(about);
  std::vector<const CLI::Option*> words = positionals_of(command);
  for (const CLI::Option* option : options_of(command)) words.push_back(option);
  append_list(words, page);
}

}  // namespace

std::string man_text(const CLI::App& program) {
  std::string page;
  append_list(options_of(program), page);
  if (commands_of(program).empty()) return page;
  page += ".Pp\nThe commands:\n.Bl -tag -width Ds\n";
  for (const CLI::App* command : commands_of(program)) append_command(*command, ' ' + command->get_name(), page);
  return page + ".El\n";
}

}  // namespace quorvel::tools
