// Property lists as JSON: everything that is printed is read back as an equal value, and nothing is guessed at.
#include "common/json.h"

#include <bit>
#include <cmath>

#include "support/values.h"

namespace quorvel::tools {

// JSON texts in the form in which they are printed, one for every kind and every border of one.
TEST(Json, PrintsWhatItReads) {
  const char* texts[] = {
      R"("text with \"quotes\", \u0000, \u001b and 日本語 😀")",
      R"("\u007f\u009b2J\u2028\u202e\u200b\ufeff\udb40\udc41  ")",
      R"([true,0,-9223372036854775808,18446744073709551615,2.0,-0.0,1e+300,5e-324,0.1])",
      R"([{"$real":"inf"},{"$real":"-inf"},{"$real":"nan"},{"$real":"nan:fff8000000000001"}])",
      R"([{"$data":""},{"$data":"AA=="},{"$data":"AAE="},{"$data":"AAEC"}])",
      R"([{"$date":"2026-01-31T12:00:00Z"},{"$date":"2001-01-01T00:00:00Z"},{"$date":"2000-12-31T23:59:59.75Z"}])",
      R"([{"$date":"0001-01-01T00:00:00Z"},{"$date":"9999-12-31T23:59:59.5Z"},{"$date":-0.0}])",
      R"([{"$date":1e+300},{"$date":{"$real":"nan"}}])",
      R"({"$$data":"the user's own"})",
      R"({"$$$date":{"$$real":1}})",
      R"({"$data":"not alone","more":1})",
      R"({"$other":{"$$$data":false}})",
      R"({"":[],"a":{},"b":[[1,2.5],{"$data":"/+8="}]})",
  };
  for (const char* text : texts) {
    const ParsedJson parsed = parse_json(text);
    EXPECT_EQ(parsed.error.value_or(""), "") << text;
    EXPECT_EQ(to_json(parsed.value, -1), text);
    EXPECT_EQ(parse_json(to_json(parsed.value, 2)).value, parsed.value) << text;
  }
}

TEST(Json, KeepsEveryBitOfDatesAndReals) {
  std::uint64_t bits = 0x9e3779b97f4a7c15;
  const double borders[] = {0.1, -1e-9, 1e-300, 791'553'600.1234567, 252'423'993'599.99997, -63'113'904'000.5};
  for (int i = 0; i < 20'000; ++i) {
    bits ^= bits << 13, bits ^= bits >> 7, bits ^= bits << 17;
    // Every other number lies within the calendar, where dates are texts.
    const double number = i < 6 ? borders[i]
                          : i % 2
                              ? std::bit_cast<double>(bits)
                              : static_cast<double>(static_cast<std::int64_t>(bits)) / 4e7 * std::ldexp(1.0, -(i % 60));
    for (const PropertyValue& value : {PropertyValue::date(number), PropertyValue::real(number)}) {
      const std::string text = to_json(value, -1);
      const PropertyValue back = parse_json(text).value;
      ASSERT_EQ(back.kind(), value.kind()) << text;
      ASSERT_EQ(std::bit_cast<std::uint64_t>(back.to_double()), std::bit_cast<std::uint64_t>(number)) << text;
    }
  }
}

TEST(Json, RefusesWhatItCannotStore) {
  const std::pair<const char*, std::vector<std::string>> refusals[] = {
      {"not valid JSON", {"", "{\"a\":1", "1 2", "[1e999]", R"("\ud800")", R"("\udc00\ud800")", "\"\xff\""}},
      {"is outside", {"18446744073709551616", "-9223372036854775809"}},
      {"null stands for no value", {"[null]"}},
      {"stands twice", {R"({"a":1,"\u0061":2})"}},
      {"$data takes", {R"({"$data":1})", R"({"$data":"AAE"})", R"({"$data":"AAF="})", R"({"$data":"A A="})"}},
      {"$data takes", {R"({"$data":"AA==AA=="})"}},
      {"$date takes", {R"({"$date":"2026-02-30T00:00:00Z"})", R"({"$date":"2026-01-31T24:00:00Z"})"}},
      {"$date takes", {R"({"$date":"2026-01-31T12:00:00"})", R"({"$date":"2026-01-31T12:00:00.Z"})"}},
      {"$date takes", {R"({"$date":"+026-01-31T12:00:00Z"})", R"({"$date":5})"}},
      {"$real takes", {R"({"$real":"nan:7ff0000000000000"})", R"({"$real":"1"})"}},
      {"deep", {std::string(513, '[') + std::string(513, ']'), std::string(5'000'000, '[')}},
  };
  for (const auto& [reason, texts] : refusals) {
    for (const std::string& text : texts) {
      const ParsedJson parsed = parse_json(text);
      EXPECT_FALSE(parsed.value) << text.substr(0, 80);
      const std::string error = parsed.error.value_or("(taken)");
      EXPECT_NE(error.find(reason), std::string::npos) << text.substr(0, 80) << ": " << error;
    }
  }
  EXPECT_FALSE(parse_json("null").error);
  EXPECT_FALSE(parse_json("null").value);
}

}  // namespace quorvel::tools
