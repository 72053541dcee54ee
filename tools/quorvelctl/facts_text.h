// The facts of a device for a reader and for a program.
#pragma once

#include <string>
#include <vector>

#include "live_answer.h"

namespace quorvel::tools {

/// The name of a value's kind, as people say it.
[[nodiscard]] std::string_view kind_name(PropertyKind kind);

/// An answer with its unit if it is a number that has one, on one line, or the words that there is none.
[[nodiscard]] std::string value_text(const LiveAnswer& fact);

/// Facts by domain, keys and values in columns, each with its kind and origin: in a column too, or on lines of their
/// own when that is wider than `width`.
[[nodiscard]] std::string facts_text(const std::vector<LiveAnswer>& facts, std::size_t width);

/// One fact as a dictionary: "key", "domain" if it has one, and if there is an answer "value", "kind", "unit",
/// "origin".
[[nodiscard]] PropertyValue fact_value(const LiveAnswer& fact);

}  // namespace quorvel::tools
