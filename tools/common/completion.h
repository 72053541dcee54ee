// What can stand next in an unfinished call: the shells' completions ask the program itself.
#pragma once

#include <functional>
#include <map>
#include <optional>
#include <string>
#include <vector>

namespace CLI {
class App;
}

namespace quorvel::tools {

struct Candidate {
  std::string text;
  std::string description = {};
};

/// An unfinished call up to the value that is being typed.
struct UnfinishedCall {
  std::string command;                       // the command's full name, such as "quorvelctl ark get"
  std::string value;                         // the name of the value, such as KEY
  std::map<std::string, std::string> given;  // values so far, by the option's long name or the word's name
};

/// Gives the known values for a call. Must not throw but std::bad_alloc.
using Candidates = std::function<std::vector<Candidate>(const UnfinishedCall&)>;

/// What a shell is told: a line for each candidate, the text, a tab and the description; or one line ":file" or
/// ":directory". Of an unfinished "--option=value" the value alone is told.
[[nodiscard]] std::string complete(const CLI::App& program, const std::vector<std::string>& words,
                                   const Candidates& candidates);

/// Answers the calls that no help mentions: "__complete WORDS...", in which a shell asks what can stand in place of the
/// last of the words, and "__man", which prints the program's part of its man page. Nothing for any other call.
[[nodiscard]] std::optional<std::string> answer_for_tools(const CLI::App& program, int count, char** words,
                                                          const Candidates& candidates);

}  // namespace quorvel::tools
