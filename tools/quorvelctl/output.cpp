#include "output.h"

#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <cstring>

#include "common/failure.h"
#include "common/human_text.h"
#include "common/json.h"

namespace quorvel::tools {

void write_output(std::string_view text) {
  while (!text.empty()) {
    const ssize_t written = ::write(STDOUT_FILENO, text.data(), text.size());
    if (written >= 0) {
      text.remove_prefix(static_cast<std::size_t>(written));
    } else if (errno != EINTR) {
      throw Failure{kUnreachable, std::string("cannot write to standard output: ") + std::strerror(errno)};
    }
  }
}

int print_value(const PropertyValue& value, bool json) {
  write_output(json ? to_json(value, 2) + '\n' : human_text(value));
  return kDone;
}

void add_raw(CLI::App& command, bool& raw) {
  command.add_flag("--raw", raw, "Print a text without escapes and data as its bytes, for a file or a pipe");
}

int print_value(const PropertyValue& value, const Form& form) {
  if (form.json && form.raw) throw Failure{kWrongWords, "--json and --raw do not go together; use one of them"};
  const bool terminal = ::isatty(STDOUT_FILENO) == 1;
  if (form.raw && value.kind() == PropertyKind::data) {
    if (terminal) throw Failure{kWrongWords, "the value is data, which a terminal cannot show; redirect it to a file"};
    write_output({reinterpret_cast<const char*>(value.bytes().data()), value.bytes().size()});
    return kDone;
  }
  if (form.raw && value.is_string() && !terminal) {
    write_output(std::string(value.text()) + '\n');
    return kDone;
  }
  return print_value(value, form.json);
}

int print_no_value(const std::string& why, bool json) {
  if (json) write_output("null\n");
  note(why);
  return kNoValue;
}

void note(const std::string& text) {
  const std::string line = "quorvelctl: " + displayable(text) + '\n';
  // A reader who cannot be told is not a reason to fail.
  [[maybe_unused]] const ssize_t written = ::write(STDERR_FILENO, line.data(), line.size());
}

PropertyValue value_of_word(const std::string& word, const std::string& what) {
  ParsedJson parsed = parse_json(word);
  if (parsed.error) throw Failure{kWrongWords, what + ": " + *parsed.error};
  return std::move(parsed.value);
}

void end_when_interrupted() {
  struct sigaction action {};
  action.sa_handler = [](int) { ::_exit(kDone); };
  ::sigaction(SIGINT, &action, nullptr);
  ::sigaction(SIGTERM, &action, nullptr);
}

}  // namespace quorvel::tools
