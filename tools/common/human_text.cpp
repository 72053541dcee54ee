#include "human_text.h"

#include <sys/ioctl.h>
#include <unistd.h>

#include <algorithm>
#include <cstdlib>
#include <vector>

#include "property/description.h"

namespace quorvel::tools {
namespace {

constexpr Palette kPlain{};
constexpr Palette kColours{"\x1b[36m", "\x1b[2m", "\x1b[1m", "\x1b[1;31m", "\x1b[0m"};

// A terminal that does not tell its width says that it has none.
constexpr std::size_t kNarrowest = 40;
constexpr std::size_t kUsualWidth = 80;
// A key that is longer does not push the values of others to the right.
constexpr std::size_t kLongestAligned = 32;

bool wants_colours() {
  const char* terminal = std::getenv("TERM");
  const char* refused = std::getenv("NO_COLOR");
  return ::isatty(STDOUT_FILENO) == 1 && (refused == nullptr || *refused == '\0') && terminal != nullptr &&
         std::string_view(terminal) != "dumb";
}

void append_value(const PropertyValue& value, std::size_t depth, std::string& text);

bool has_lines(const PropertyValue& value) { return value.is_container() && value.size() > 0; }

// What follows a key or dash: a leaf `gap` columns behind it, a container's elements on lines of their own.
void append_element(const PropertyValue& value, std::size_t gap, std::size_t depth, std::string& text) {
  if (has_lines(value)) {
    text += '\n';
    append_value(value, depth + 1, text);
  } else {
    text.append(gap, ' ').append(one_line(value)).append("\n");
  }
}

void append_dictionary(const PropertyValue& dictionary, std::size_t depth, std::string& text) {
  std::vector<std::pair<std::string_view, const PropertyValue*>> entries;
  for (const auto [key, value] : dictionary.entries()) entries.emplace_back(key.text(), &value);
  std::sort(entries.begin(), entries.end(), [](const auto& a, const auto& b) { return a.first < b.first; });
  const auto name_of = [](std::string_view key) { return one_line(PropertyValue::string(key)); };
  std::size_t widest = 0;
  for (const auto& [key, value] : entries) {
    const std::size_t columns = has_lines(*value) ? 0 : columns_of(name_of(key));
    if (columns <= kLongestAligned) widest = std::max(widest, columns);
  }
  const Palette& colours = palette();
  for (const auto& [key, value] : entries) {
    const std::string name = name_of(key);
    text.append(2 * depth, ' ').append(colours.key).append(name).append(colours.reset).append(":");
    append_element(*value, std::max(widest + 1, columns_of(name) + 1) - columns_of(name), depth, text);
  }
}

void append_value(const PropertyValue& value, std::size_t depth, std::string& text) {
  if (value.is_dictionary()) return append_dictionary(value, depth, text);
  for (std::size_t i = 0; i < value.size(); ++i) {
    text.append(2 * depth, ' ').append("-");
    append_element(value.at(i), 1, depth, text);
  }
}

// The text that `fill` puts into a sink; `size` is a guess at its length.
template <typename Fill>
std::string filled(std::size_t size, const Fill& fill) {
  for (std::string text;; size *= 2) {
    text.resize(size);
    TextSink sink(text);
    fill(sink);
    if (sink.full()) continue;
    text.resize(static_cast<std::size_t>(sink.position() - text.data()));
    return text;
  }
}

}  // namespace

const Palette& palette() {
  static const Palette& chosen = wants_colours() ? kColours : kPlain;
  return chosen;
}

std::string displayable(std::string_view text) {
  return filled(text.size() * 4, [text](TextSink& sink) { sink.put_escaped(text); });
}

std::size_t columns_of(std::string_view text) {
  return static_cast<std::size_t>(std::count_if(
      text.begin(), text.end(), [](char byte) { return (static_cast<unsigned char>(byte) & 0xc0) != 0x80; }));
}

std::string wrapped(std::string_view text, std::size_t indent, std::size_t width) {
  std::string lines;
  std::size_t column = indent;
  const auto end_line = [&] {
    lines.append("\n").append(indent, ' ');
    column = indent;
  };
  for (std::size_t start = 0; start < text.size();) {
    const std::size_t end = std::min(text.find_first_of(" \n", start), text.size());
    if (column > indent && column + 1 + (end - start) > width) end_line();
    if (column > indent) ++column, lines += ' ';
    lines.append(text, start, end - start);
    column += end - start;
    if (end < text.size() && text[end] == '\n') end_line();
    start = end + 1;
  }
  return lines;
}

std::optional<std::size_t> terminal_width() {
  winsize size{};
  if (::ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) != 0) return std::nullopt;
  return size.ws_col < kNarrowest ? kUsualWidth : size.ws_col;
}

std::string shell_word(std::string_view word) {
  constexpr std::string_view kUnquoted = "abcdefghijklmnopqrstuvwxyzABCDEFGHIJKLMNOPQRSTUVWXYZ0123456789_-./:,+@%";
  if (!word.empty() && word.find_first_not_of(kUnquoted) == std::string_view::npos) return std::string(word);
  std::string quoted = "'";
  for (const char byte : word) quoted.append(byte == '\'' ? "'\\''" : std::string(1, byte));
  return quoted + '\'';
}

std::string one_line(const PropertyValue& value) {
  if (value.is_string() && value.text().empty()) return "\"\"";
  return filled(256, [&value](TextSink& sink) { describe(value, sink); });
}

std::string human_text(const PropertyValue& value) {
  std::string text;
  if (value.is_container() && value.size() > 0) {
    append_value(value, 0, text);
  } else {
    text = one_line(value) + '\n';
  }
  return text;
}

}  // namespace quorvel::tools
