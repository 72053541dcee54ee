// What goes to standard output: the value asked for and nothing else. Everything else goes to standard error.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <utility>

#include "property/value.h"

namespace CLI {
class App;
}

namespace quorvel::tools {

/// Writes and flushes; throws Failure when that cannot be done.
void write_output(std::string_view text);

/// Prints a value for a reader or as JSON. Returns kDone.
int print_value(const PropertyValue& value, bool json);

/// How a single value is printed.
struct Form {
  bool json = false;
  bool raw = false;
};

/// The switch --raw of a command that prints a single value.
void add_raw(CLI::App& command, bool& raw);

/// Prints a single value. With `raw`, data is its bytes and nothing else, and a text its own line; a terminal gets
/// neither bytes nor characters that are unsafe to display. Returns kDone.
int print_value(const PropertyValue& value, const Form& form);

/// What a command changed, for programs only: with `json` one dictionary of `names`, and of `value` under `key`.
/// Returns kDone.
int print_change(std::initializer_list<std::pair<std::string_view, std::string>> names, std::string_view key,
                 const PropertyValue& value, bool json);

/// For a value that is not there: `null` with `json`, and `why` on standard error. Returns kNoValue.
int print_no_value(const std::string& why, bool json);

/// A line for the reader on standard error.
void note(const std::string& text);

/// The value that a word of the call stands for as JSON, none for null. Throws Failure with `what` when it is not JSON.
[[nodiscard]] PropertyValue value_of_word(const std::string& word, const std::string& what);

/// The integer that a word of the call stands for; throws Failure with `what` when it is none from `minimum` to
/// `maximum`.
[[nodiscard]] std::int64_t number_of_word(const std::string& word, const std::string& what, std::int64_t minimum,
                                          std::int64_t maximum);

/// The present time as dates have it, in whole milliseconds.
[[nodiscard]] double seconds_now();

/// Has SIGINT and SIGTERM end the process with status 0: for commands that run until they are interrupted and write
/// whole lines.
void end_when_interrupted();

}  // namespace quorvel::tools
