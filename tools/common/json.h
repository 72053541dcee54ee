// Property-list values as JSON, both ways; what is written is read back as an equal value.
//
//   string, integer, boolean, array, dictionary   as JSON has them, keys in ascending order
//   real            a number with a point or an exponent; {"$real": "inf"}, "-inf", "nan", and "nan:" with the sixteen
//                   hexadecimal digits of a NaN that is not the usual one
//   data            {"$data": "BASE64"}
//   date            {"$date": "2026-01-31T12:00:00Z"}; outside the years 1 to 9999 {"$date": REAL} with the seconds
//                   since 2001-01-01T00:00:00Z
//   no value        null, at the top only
//   a dictionary whose only key is "$real", "$data" or "$date", or one of these with further $ in front, has one more $
//                   in front of that key
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "property/value.h"

namespace quorvel::tools {

/// `value` as JSON text without a line end; over several lines when `indent` is not negative. Characters that are
/// unsafe to display are escaped.
[[nodiscard]] std::string to_json(const PropertyValue& value, int indent);

/// What a JSON text stands for, or why it stands for no value.
struct ParsedJson {
  PropertyValue value;
  std::optional<std::string> error;
};

[[nodiscard]] ParsedJson parse_json(std::string_view text);

/// `text` as a JSON string; bytes that are not UTF-8 are replaced.
[[nodiscard]] std::string json_string(std::string_view text);

}  // namespace quorvel::tools
