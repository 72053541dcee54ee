#include <bit>
#include <cmath>
#include <cstdio>
#include <limits>
#include <nlohmann/json.hpp>

#include "base64.h"
#include "date_text.h"
#include "json.h"
#include "json_forms.h"

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

}  // namespace

std::string to_json(const PropertyValue& value, int indent) {
  return value_json(value).dump(indent, ' ', false, json::error_handler_t::replace);
}

std::string json_string(std::string_view text) {
  return json(text).dump(-1, ' ', false, json::error_handler_t::replace);
}

}  // namespace quorvel::tools
