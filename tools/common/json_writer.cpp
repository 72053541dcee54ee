#include <bit>
#include <cmath>
#include <cstdio>
#include <limits>
#include <nlohmann/json.hpp>

#include "base64.h"
#include "date_text.h"
#include "json.h"
#include "json_forms.h"
#include "property/unicode.h"

namespace quorvel::tools {
namespace {

using nlohmann::json;

json real_json(double number) {
  if (std::isfinite(number)) return number;
  std::string text(number > 0 ? kInfinity : kMinusInfinity);
  if (std::isnan(number)) {
    const auto bits = std::bit_cast<std::uint64_t>(number);
    text = kNotANumber;
    if (bits != std::bit_cast<std::uint64_t>(std::numeric_limits<double>::quiet_NaN())) {
      char digits[32];
      std::snprintf(digits, sizeof digits, "%016llx", static_cast<unsigned long long>(bits));
      text = std::string(kNotANumberBits) + digits;
    }
  }
  return json::object({{std::string(kRealForm), text}});
}

json date_json(double seconds) {
  const std::optional<std::string> text = date_text(seconds);
  return json::object({{std::string(kDateForm), text ? json(*text) : real_json(seconds)}});
}

json integer_json(const PropertyValue& value) {
  if (const std::optional<std::int64_t> number = value.to_int64()) return *number;
  return value.to_uint64().value_or(0);
}

json value_json(const PropertyValue& value);

json array_json(const PropertyValue& array) {
  json result = json::array();
  for (std::size_t i = 0; i < array.size(); ++i) result.push_back(value_json(array.at(i)));
  return result;
}

json dictionary_json(const PropertyValue& dictionary) {
  json result = json::object();
  const bool only = dictionary.size() == 1;
  for (const auto [key, value] : dictionary.entries()) {
    const std::string escape = only && is_form_name(key.text()) ? "$" : "";
    result.emplace(escape + std::string(key.text()), value_json(value));
  }
  return result;
}

json value_json(const PropertyValue& value) {
  switch (value.kind()) {
    case PropertyKind::none: return nullptr;
    case PropertyKind::boolean: return value.to_boolean();
    case PropertyKind::integer: return integer_json(value);
    case PropertyKind::real: return real_json(value.to_double());
    case PropertyKind::date: return date_json(value.to_double());
    case PropertyKind::string: return std::string(value.text());
    case PropertyKind::data: return json::object({{std::string(kDataForm), encode_base64(value.bytes())}});
    case PropertyKind::array: return array_json(value);
    case PropertyKind::dictionary: return dictionary_json(value);
  }
  return nullptr;
}

void append_code_unit(unsigned unit, std::string& text) {
  char escape[8];
  std::snprintf(escape, sizeof escape, "\\u%04x", unit & 0xffff);
  text += escape;
}

// The JSON text, in which the serialiser has escaped C0 controls, with everything else that is unsafe to display
// escaped as well. Such characters stand within strings only, but for the line ends between the elements.
std::string displayable_json(const json& value, int indent) {
  const std::string dumped = value.dump(indent, ' ', false, json::error_handler_t::replace);
  std::string text;
  text.reserve(dumped.size());
  for (std::size_t at = 0; at < dumped.size();) {
    const std::string_view character(dumped.data() + at, std::max<std::size_t>(utf8_character_length(dumped, at), 1));
    at += character.size();
    if (character == "\n" || !is_unsafe_to_display(character)) {
      text += character;
      continue;
    }
    std::byte units[4];
    const std::byte* end = write_utf16(character, units);
    for (const std::byte* unit = units; unit < end; unit += 2) {
      append_code_unit(std::to_integer<unsigned>(unit[0]) << 8 | std::to_integer<unsigned>(unit[1]), text);
    }
  }
  return text;
}

}  // namespace

std::string to_json(const PropertyValue& value, int indent) { return displayable_json(value_json(value), indent); }

std::string json_string(std::string_view text) { return displayable_json(json(text), -1); }

}  // namespace quorvel::tools
