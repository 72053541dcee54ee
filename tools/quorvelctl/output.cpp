#include "output.h"

#include <poll.h>
#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <chrono>
#include <csignal>
#include <cstring>

#include "common/command_line.h"
#include "common/failure.h"
#include "common/human_text.h"
#include "common/json.h"

namespace quorvel::tools {

void write_output(std::string_view text) {
  while (!text.empty()) {
    const ssize_t written = ::write(STDOUT_FILENO, text.data(), text.size());
    if (written >= 0) {
      text.remove_prefix(static_cast<std::size_t>(written));
    } else if (errno == EAGAIN) {
      // Another program that has the same pipe or terminal may have set it not to wait.
      pollfd room = {STDOUT_FILENO, POLLOUT, 0};
      ::poll(&room, 1, -1);
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
  add_switch(command, "--raw", raw, "Print a text without escapes and data as its bytes, for a file or a pipe");
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

int print_change(std::initializer_list<std::pair<std::string_view, std::string>> names, std::string_view key,
                 const PropertyValue& value, bool json) {
  if (!json) return kDone;
  PropertyValue change = PropertyValue::dictionary();
  // A path may be no valid text; it is shown as well as it can be.
  for (const auto& [name, text] : names) put(change, name, PropertyValue::string(displayable(text)));
  if (value) put(change, key, value);
  return print_value(change, true);
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

std::int64_t number_of_word(const std::string& word, const std::string& what, std::int64_t minimum,
                            std::int64_t maximum) {
  std::int64_t result = 0;
  const auto [end, failure] = std::from_chars(word.data(), word.data() + word.size(), result);
  if (failure == std::errc{} && end == word.data() + word.size() && result >= minimum && result <= maximum)
    return result;
  throw Failure{kWrongWords, what + " is \"" + word + "\", but takes an integer from " + std::to_string(minimum) +
                                 (maximum == INT64_MAX ? " up" : " to " + std::to_string(maximum))};
}

double seconds_now() {
  using namespace std::chrono_literals;
  constexpr auto kEpoch = std::chrono::sys_days{2001y / 1 / 1};
  const auto now = std::chrono::time_point_cast<std::chrono::milliseconds>(std::chrono::system_clock::now());
  return std::chrono::duration<double>(now - kEpoch).count();
}

void end_when_interrupted() {
  struct sigaction action {};
  action.sa_handler = [](int) { ::_exit(kDone); };
  ::sigaction(SIGINT, &action, nullptr);
  ::sigaction(SIGTERM, &action, nullptr);
}

}  // namespace quorvel::tools
