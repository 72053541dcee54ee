// How a program's commands, words and options are added to its command line.
//
// The words are written once, where a command is added: from them come the help, the completions and the man page's
// list of commands. The parser's own header takes longer to compile than all of ours together; only files that look
// into the parser include it (command_words.h).
#pragma once

#include <functional>
#include <string>
#include <vector>

namespace CLI {
class App;
}

namespace quorvel::tools {

struct CommandWords {
  std::string name;
  std::string summary;     // one sentence without a full stop
  std::string examples;    // lines of at most 78 columns; empty: none
  std::string about = {};  // whole sentences; empty lines part paragraphs
};

/// Adds a command that the words of a call may choose. The parser owns what it returns.
CLI::App& add_command(CLI::App& parent, const CommandWords& words);
/// Adds a command that does nothing but lead to those below it, one of which a call has to choose.
CLI::App& add_group(CLI::App& parent, const CommandWords& words);

// What a call gives for a word or an option goes where the function that adds it says, which must outlive the parsing.

/// A word that a command needs, taken as it stands.
void add_word(CLI::App& command, const std::string& name, std::string& word, const std::string& help);
/// Any number of words.
void add_words(CLI::App& command, const std::string& name, std::vector<std::string>& words, const std::string& help);

enum class Need { kOptional, kRequired };
/// An option with a value, which the help calls `value_name`, taken as it stands.
void add_option(CLI::App& command, const std::string& name, std::string& value, const std::string& value_name,
                const std::string& help, Need need = Need::kOptional);
/// An option without a value.
void add_switch(CLI::App& command, const std::string& name, bool& on, const std::string& help);

/// Has `then` called when the words of a call have chosen the command and are taken.
void when_chosen(CLI::App& command, std::function<void()> then);
/// Whether a call has given the option, which must be one of this command's.
[[nodiscard]] bool is_given(const CLI::App& command, const std::string& option);

}  // namespace quorvel::tools
