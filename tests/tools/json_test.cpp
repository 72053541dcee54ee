// Property lists as JSON: everything that is printed is read back as an equal value, and nothing is guessed at.
#include "common/json.h"

#include <gtest/gtest.h>

#include <bit>
#include <cmath>
#include <limits>

#include "support/values.h"

namespace quorvel::tools {
namespace {

// JSON texts in the form in which they are printed, one for every kind and every border of one.
TEST(Json, PrintsWhatItReads) {
  const char* texts[] = {
      R"("text with \"quotes\", \u0000, \u001b and 日本語 😀")",
      "true",
      "0",
      "-9223372036854775808",
      "18446744073709551615",
      "2.0",
      "-0.0",
      "1e+300",
      "5e-324",
      "0.1",
      R"({"$real":"inf"})",
      R"({"$real":"-inf"})",
      R"({"$real":"nan"})",
      R"({"$real":"nan:fff8000000000001"})",
      R"({"$data":""})",
      R"({"$data":"AA=="})",
      R"({"$data":"AAE="})",
      R"({"$data":"AAEC"})",
      R"({"$date":"2026-01-31T12:00:00Z"})",
      R"({"$date":"2001-01-01T00:00:00Z"})",
      R"({"$date":"2000-12-31T23:59:59.75Z"})",
      R"({"$date":"0001-01-01T00:00:00Z"})",
      R"({"$date":"9999-12-31T23:59:59.5Z"})",
      R"({"$date":-0.0})",
      R"({"$date":1e+300})",
      R"({"$date":{"$real":"nan"}})",
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
  const double borders[] = {0.1,
                            -0.1,
                            791'553'600.123456789,
                            -1e-9,
                            1e-300,
                            -1e-300,
                            252'423'993'599.99997,
                            -63'113'904'000.0,
                            -63'113'904'000.5,
                            252'423'993'600.0,
                            4503599627370495.5};
  for (int i = 0; i < 20'000; ++i) {
    bits ^= bits << 13, bits ^= bits >> 7, bits ^= bits << 17;
    // Every other number lies within the calendar, where dates are texts.
    const double number = i < 11 ? borders[i]
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
  const std::pair<std::string, const char*> texts[] = {
      {"", "not valid JSON"},
      {"{\"a\":1", "not valid JSON"},
      {"1 2", "not valid JSON"},
      {"[1e999]", "not valid JSON"},
      {R"("\ud800")", "not valid JSON"},
      {R"("\udc00\ud800")", "not valid JSON"},
      {"\"\xff\"", "not valid JSON"},
      {"18446744073709551616", "is outside"},
      {"-9223372036854775809", "is outside"},
      {"[null]", "null stands for no value"},
      {R"({"a":1,"\u0061":2})", "stands twice"},
      {R"({"$data":1})", "$data takes"},
      {R"({"$data":"AAE"})", "$data takes"},
      {R"({"$data":"AAF="})", "$data takes"},
      {R"({"$data":"AA==AA=="})", "$data takes"},
      {R"({"$data":"A A="})", "$data takes"},
      {R"({"$date":"2026-02-30T00:00:00Z"})", "$date takes"},
      {R"({"$date":"2026-01-31T24:00:00Z"})", "$date takes"},
      {R"({"$date":"2026-01-31T12:00:00"})", "$date takes"},
      {R"({"$date":"2026-01-31T12:00:00.Z"})", "$date takes"},
      {R"({"$date":"+026-01-31T12:00:00Z"})", "$date takes"},
      {R"({"$date":5})", "$date takes"},
      {R"({"$real":"nan:7ff0000000000000"})", "$real takes"},
      {R"({"$real":"1"})", "$real takes"},
      {std::string(513, '[') + std::string(513, ']'), "deep"},
      {std::string(5'000'000, '['), "deep"},
  };
  for (const auto& [text, reason] : texts) {
    const ParsedJson parsed = parse_json(text);
    EXPECT_FALSE(parsed.value) << text.substr(0, 80);
    EXPECT_NE(parsed.error.value_or("").find(reason), std::string::npos)
        << text.substr(0, 80) << ": " << parsed.error.value_or("(taken)");
  }
  EXPECT_FALSE(parse_json("null").error);
  EXPECT_FALSE(parse_json("null").value);
}

}  // namespace
}  // namespace quorvel::tools
