// Property values written down tersely, and printed by GoogleTest as the log would print them:
//
//   const PropertyValue expected = dictionary({{"Status", "NotReady"}, {"Codes", array({1, 2.5, true})}});
//   EXPECT_EQ(root.read_plist("/some/file.plist"), expected);
#pragma once

#include "property/binary/binary.h"
#include "property/value.h"
#include "support/prelude.h"

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

/// Takes `value` through everything that a value must survive: mutable copy, comparison, description, writing, reading
/// again and writing again. Returns what went wrong, or null.
[[nodiscard]] const char* round_trip_fault(const PropertyValue& value);

/// Takes `file` through the check of bytes that are passed on, and compares its answer with what the reader reads and
/// the writer writes. Returns what went wrong, or null, and whether the check accepted the file.
[[nodiscard]] const char* check_fault(std::span<const std::byte> file, bool* accepted = nullptr);

/// Reads `file`, and takes what it holds, if anything, through the same.
[[nodiscard]] const char* round_trip_fault(std::span<const std::byte> file, Mutability mutability);

}  // namespace test
}  // namespace quorvel
