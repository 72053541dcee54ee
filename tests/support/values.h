// Property values written down tersely, and printed by GoogleTest as the log would print them:
//
//   const PropertyValue expected = dictionary({{"Status", "NotReady"}, {"Codes", array({1, 2.5, true})}});
//   EXPECT_EQ(root.read_plist("/some/file.plist"), expected);
#pragma once

#include <concepts>
#include <initializer_list>
#include <iosfwd>
#include <string>
#include <string_view>
#include <utility>

#include "platform/property/value.h"

namespace quorvel {

void PrintTo(const PropertyValue& value, std::ostream* out);

namespace test {

/// What may stand for a value in a list.
class Value {
 public:
  Value(PropertyValue value) : value_(std::move(value)) {}
  Value(bool value) : value_(PropertyValue::boolean(value)) {}
  Value(std::signed_integral auto value) : value_(PropertyValue::integer(value)) {}
  Value(std::unsigned_integral auto value) : value_(PropertyValue::unsigned_integer(value)) {}
  Value(double value) : value_(PropertyValue::real(value)) {}
  Value(const char* text) : value_(PropertyValue::string(text)) {}
  Value(std::string_view text) : value_(PropertyValue::string(text)) {}
  Value(const std::string& text) : value_(PropertyValue::string(text)) {}
  [[nodiscard]] const PropertyValue& value() const { return value_; }

 private:
  PropertyValue value_;
};

[[nodiscard]] PropertyValue dictionary(std::initializer_list<std::pair<std::string_view, Value>> entries);
[[nodiscard]] PropertyValue array(std::initializer_list<Value> elements);
[[nodiscard]] PropertyValue text(std::string_view utf8);
[[nodiscard]] PropertyValue data(std::string_view bytes);

/// The description of a value, whole.
[[nodiscard]] std::string described(const PropertyValue& value);

/// The binary encoding of a value.
[[nodiscard]] std::string encoded(const PropertyValue& value);

}  // namespace test
}  // namespace quorvel
