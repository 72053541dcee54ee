// Values for a reader at a terminal.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "property/value.h"

namespace quorvel::tools {

/// Which texts stand out on a terminal; every one is empty elsewhere.
struct Palette {
  std::string_view key, quiet, strong, warning, reset;
};

/// The palette for standard output.
[[nodiscard]] const Palette& palette();

/// `text` on one line of a terminal, as the log would show it: what is unsafe to display is escaped.
[[nodiscard]] std::string displayable(std::string_view text);

/// How many characters a text has, so that columns stay straight where some take more than one byte.
[[nodiscard]] std::size_t columns_of(std::string_view text);

/// `text`, which begins at column `indent`, in lines of at most `width` columns that are cut at blanks and begin there
/// too; line ends within it stay. A word that is longer has a line of its own.
[[nodiscard]] std::string wrapped(std::string_view text, std::size_t indent, std::size_t width);

/// How wide standard output's terminal is; nothing when it is no terminal.
[[nodiscard]] std::optional<std::size_t> terminal_width();

/// `word` as a shell takes it for one word, quoted where needed.
[[nodiscard]] std::string shell_word(std::string_view word);

/// A value that fits one line, described like in the log.
[[nodiscard]] std::string one_line(const PropertyValue& value);

/// A value over as many lines as it takes, indented, keys in ascending order, ending with a line end.
[[nodiscard]] std::string human_text(const PropertyValue& value);

}  // namespace quorvel::tools
