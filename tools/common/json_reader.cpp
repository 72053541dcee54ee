#include <charconv>
#include <cmath>
#include <limits>
#include <nlohmann/json.hpp>
#include <vector>

#include "base64.h"
#include "date_text.h"
#include "json.h"
#include "json_forms.h"
#include "property/limits.h"

namespace quorvel::tools {
namespace {

using nlohmann::json;

std::optional<double> parse_real_text(std::string_view text) {
  if (text == kInfinity) return std::numeric_limits<double>::infinity();
  if (text == kMinusInfinity) return -std::numeric_limits<double>::infinity();
  if (text == kNotANumber) return std::numeric_limits<double>::quiet_NaN();
  if (!text.starts_with(kNotANumberBits) || text.size() != kNotANumberBits.size() + 16) return std::nullopt;
  std::uint64_t bits = 0;
  const auto [end, failure] =
      std::from_chars(text.data() + kNotANumberBits.size(), text.data() + text.size(), bits, 16);
  if (failure != std::errc{} || end != text.data() + text.size()) return std::nullopt;
  const auto number = std::bit_cast<double>(bits);
  return std::isnan(number) ? std::optional(number) : std::nullopt;
}

// Builds the value while the text is read, so that neither depth nor size is met twice.
class Builder : public nlohmann::json_sax<json> {
 public:
  bool null() override {
    if (open_.empty()) return true;
    return refuse("null stands for no value, which a dictionary or array cannot hold; leave the entry out");
  }
  bool boolean(bool value) override { return put(PropertyValue::boolean(value)); }
  bool number_integer(std::int64_t value) override { return put(PropertyValue::integer(value)); }
  bool number_unsigned(std::uint64_t value) override { return put(PropertyValue::unsigned_integer(value)); }
  bool number_float(double value, const std::string& text) override {
    if (text.find_first_of(".eE") == std::string::npos) {
      return refuse("the integer " + text +
                    " is outside -9223372036854775808 to 18446744073709551615; write it with "
                    "a decimal point to store it as a real");
    }
    return put(PropertyValue::real(value));
  }
  bool string(std::string& value) override { return put(PropertyValue::string(value)); }
  bool binary(json::binary_t&) override { return refuse("binary JSON is not taken"); }
  bool start_object(std::size_t) override { return start(PropertyValue::dictionary()); }
  bool start_array(std::size_t) override { return start(PropertyValue::array()); }
  bool end_array() override { return end(); }
  bool end_object() override { return end(); }
  bool key(std::string& key) override {
    open_.back().key = PropertyValue::string(key);
    if (!open_.back().container.get(key)) return true;
    return refuse("the key " + json_string(key) + " stands twice in one dictionary; keep one of them");
  }
  bool parse_error(std::size_t, const std::string&, const nlohmann::detail::exception& failure) override {
    std::string what = failure.what();
    const std::size_t end_of_tag = what.find("] ");
    return refuse("not valid JSON: " + (end_of_tag == std::string::npos ? what : what.substr(end_of_tag + 2)) +
                  ". Texts need double quotes, as in '\"text\"'");
  }

  ParsedJson take() { return {error_ ? PropertyValue() : std::move(result_), std::move(error_)}; }

 private:
  struct Open {
    PropertyValue container;
    PropertyValue key;
  };

  bool refuse(std::string why) {
    if (!error_) error_ = std::move(why);
    return false;
  }

  bool start(PropertyValue container) {
    if (open_.size() == kMaximumDepth) {
      return refuse("containers lie more than " + std::to_string(kMaximumDepth) + " deep");
    }
    open_.push_back({std::move(container), {}});
    return true;
  }

  bool end() {
    PropertyValue container = std::move(open_.back().container);
    open_.pop_back();
    if (container.is_dictionary() && container.size() == 1) return end_only_entry(container);
    return put(std::move(container));
  }

  // A dictionary of one entry, which may be the form of another kind.
  bool end_only_entry(const PropertyValue& dictionary) {
    const auto [key, value] = *dictionary.entries().begin();
    const std::string_view name = key.text();
    if (!is_form_name(name)) return put(dictionary);
    if (name.starts_with("$$")) {
      PropertyValue unescaped = PropertyValue::dictionary();
      if (!unescaped.set(name.substr(1), value)) return refuse("memory does not suffice");
      return put(std::move(unescaped));
    }
    PropertyValue formed = form(name, value);
    if (formed) return put(std::move(formed));
    return refuse(std::string(name) + " takes " + expected(name) + "; for a dictionary with this key write \"$" +
                  std::string(name) + "\"");
  }

  static PropertyValue form(std::string_view name, const PropertyValue& value) {
    if (name == kDateForm && value.kind() == PropertyKind::real) return PropertyValue::date(value.to_double());
    if (!value.is_string()) return {};
    if (name == kDataForm) {
      const std::optional<std::vector<std::byte>> bytes = decode_base64(value.text());
      return bytes ? PropertyValue::data(*bytes) : PropertyValue();
    }
    const std::optional<double> number =
        name == kDateForm ? parse_date_text(value.text()) : parse_real_text(value.text());
    if (!number) return {};
    return name == kDateForm ? PropertyValue::date(*number) : PropertyValue::real(*number);
  }

  static std::string expected(std::string_view name) {
    if (name == kDataForm) return "a base64 text with its padding";
    if (name == kRealForm) return R"("inf", "-inf", "nan", or "nan:" with sixteen hexadecimal digits)";
    return R"(a text such as "2026-01-31T12:00:00Z", or a real: the seconds since 2001)";
  }

  bool put(PropertyValue value) {
    if (!value) return refuse("memory does not suffice");
    if (open_.empty()) {
      result_ = std::move(value);
      return true;
    }
    Open& open = open_.back();
    const bool stored = open.container.is_dictionary() ? open.container.set(open.key, std::move(value))
                                                       : open.container.append(std::move(value));
    return stored || refuse("memory does not suffice");
  }

  std::vector<Open> open_;
  PropertyValue result_;
  std::optional<std::string> error_;
};

}  // namespace

ParsedJson parse_json(std::string_view text) {
  Builder builder;
  json::sax_parse(text.begin(), text.end(), &builder);
  return builder.take();
}

}  // namespace quorvel::tools
