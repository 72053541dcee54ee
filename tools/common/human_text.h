// Values for a reader at a terminal.
#pragma once

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

/// `word` as a shell takes it for one word, quoted where needed.
[[nodiscard]] std::string shell_word(std::string_view word);

/// A value that fits one line, described like in the log.
[[nodiscard]] std::string one_line(const PropertyValue& value);

/// A value over as many lines as it takes, indented, keys in ascending order, ending with a line end.
[[nodiscard]] std::string human_text(const PropertyValue& value);

}  // namespace quorvel::tools
