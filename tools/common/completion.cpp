#include "completion.h"

#include <algorithm>

#include "command_words.h"
#include "help_text.h"
#include "human_text.h"

namespace quorvel::tools {
namespace {

const CLI::Option* find_option(const CLI::App* command, const std::string& name) {
  for (; command != nullptr; command = command->get_parent()) {
    if (const CLI::Option* option = command->get_option_no_throw(name)) return option;
  }
  return nullptr;
}

// Follows the words of a call as the parser would.
class Walk {
 public:
  explicit Walk(const CLI::App& program) : command_(&program) {}

  void take(const std::string& word) {
    if (pending_ != nullptr) {
      call_.given[long_name(*pending_)] = word;
      pending_ = nullptr;
    } else if (!only_words_ && word == "--") {
      only_words_ = true;
    } else if (!only_words_ && word.size() > 1 && word.starts_with('-')) {
      take_option(word);
    } else {
      take_positional(word);
    }
  }

  // The call at a word of which `typed` is there. The value's name is empty where a command or option is due.
  [[nodiscard]] UnfinishedCall at(std::string& typed) {
    const std::size_t equals = typed.find('=');
    if (pending_ == nullptr && !only_words_ && typed.starts_with("--") && equals != std::string::npos) {
      pending_ = find_option(command_, typed.substr(0, equals));
      typed.erase(0, equals + 1);
      if (pending_ == nullptr) call_.value = "-";
    }
    if (pending_ != nullptr) {
      call_.value = value_name(*pending_);
    } else if (!offers_options(typed) && commands_of(*command_).empty()) {
      const CLI::Option* word = next_positional();
      call_.value = word == nullptr ? "-" : value_name(*word);
    }
    call_.command = full_name(*command_);
    return call_;
  }

  [[nodiscard]] const CLI::App& command() const { return *command_; }

  [[nodiscard]] bool offers_options(const std::string& typed) const { return !only_words_ && typed.starts_with('-'); }

 private:
  void take_option(const std::string& word) {
    const std::size_t equals = word.find('=');
    const CLI::Option* option = find_option(command_, word.substr(0, equals));
    if (option == nullptr) return;
    if (equals != std::string::npos) {
      call_.given[long_name(*option)] = word.substr(equals + 1);
    } else if (!value_name(*option).empty()) {
      pending_ = option;
    } else {
      call_.given[long_name(*option)] = "";
    }
  }

  void take_positional(const std::string& word) {
    for (const CLI::App* below : commands_of(*command_)) {
      if (below->get_name() != word) continue;
      command_ = below;
      return;
    }
    if (const CLI::Option* option = next_positional()) call_.given[long_name(*option)] = word;
    ++positionals_;
  }

  [[nodiscard]] const CLI::Option* next_positional() const {
    const std::vector<const CLI::Option*> words = positionals_of(*command_);
    if (positionals_ < words.size()) return words[positionals_];
    return !words.empty() && takes_many(*words.back()) ? words.back() : nullptr;
  }

  const CLI::App* command_;
  UnfinishedCall call_;
  const CLI::Option* pending_ = nullptr;
  bool only_words_ = false;
  std::size_t positionals_ = 0;
};

std::vector<Candidate> options_for(const CLI::App& chosen, const UnfinishedCall& call) {
  std::vector<Candidate> options{{"--help", "Print the help and end"}};
  for (const CLI::App* command = &chosen; command != nullptr; command = command->get_parent()) {
    for (const CLI::Option* option : options_of(*command)) {
      const bool only_alone = long_name(*option) == "--version" && command != &chosen;
      if (only_alone || call.given.contains(long_name(*option))) continue;
      options.push_back({long_name(*option), option->get_description()});
    }
  }
  return options;
}

std::vector<Candidate> commands_below(const CLI::App& chosen) {
  std::vector<Candidate> commands;
  for (const CLI::App* below : commands_of(chosen)) commands.push_back({below->get_name(), summary_of(*below)});
  return commands;
}

}  // namespace

std::string complete(const CLI::App& program, const std::vector<std::string>& words, const Candidates& candidates) {
  Walk walk(program);
  std::string typed = words.empty() ? "" : words.back();
  for (std::size_t i = 0; i + 1 < words.size(); ++i) walk.take(words[i]);
  const UnfinishedCall call = walk.at(typed);
  if (call.value == "DIR") return ":directory\n";
  if (call.value == "FILE") return ":file\n";
  const auto known = [&](const UnfinishedCall& at) { return candidates ? candidates(at) : std::vector<Candidate>(); };
  const std::vector<Candidate> found = !call.value.empty()          ? known(call)
                                       : walk.offers_options(typed) ? options_for(walk.command(), call)
                                                                    : commands_below(walk.command());
  std::string lines;
  for (const Candidate& candidate : found) {
    // A text that a terminal must not see cannot be offered.
    if (!candidate.text.starts_with(typed) || displayable(candidate.text) != candidate.text) continue;
    lines += candidate.text + '\t' + displayable(candidate.description) + '\n';
  }
  return lines;
}

std::optional<std::string> answer_for_tools(const CLI::App& program, int count, char** words,
                                            const Candidates& candidates) {
  if (count < 2) return std::nullopt;
  if (std::string_view(words[1]) == "__man") return man_text(program);
  if (std::string_view(words[1]) != "__complete") return std::nullopt;
  return complete(program, {words + 2, words + count}, candidates);
}

}  // namespace quorvel::tools
