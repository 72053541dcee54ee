// Dates as ISO 8601 texts in UTC.
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace quorvel::tools {

/// `seconds` since 2001-01-01T00:00:00Z as a text such as 2026-01-31T12:00:00.5Z, with as many digits of the fraction
/// as bring back exactly the same number. Nothing for what the texts cannot say: years outside 1 to 9999, no numbers,
/// and minus zero.
[[nodiscard]] std::optional<std::string> date_text(double seconds);

/// The number behind such a text; nothing for every other text.
[[nodiscard]] std::optional<double> parse_date_text(std::string_view text);

}  // namespace quorvel::tools
