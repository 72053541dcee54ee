#include "platform/property/description.h"

#include <gtest/gtest.h>

#include "support/values.h"

namespace quorvel::test {
namespace {

TEST(Description, IsOneLineThatAReaderUnderstands) {
  const struct {
    PropertyValue value;
    std::string_view expected;
  } cases[] = {
      {nullptr, "(null)"},
      {text("Gerät"), "Gerät"},
      {text("a\nb\r\t\x1b[2J\x7f"), "a\\nb\\r\\t\\x1b[2J\\x7f"},
      {text("\u0085\u2028"), "\\xc2\\x85\\xe2\\x80\\xa8"},
      {text(std::string_view("nul\0", 4)), "nul\\x00"},
      {text("100%s \"q\""), "100%s \"q\""},
      {PropertyValue::integer(-7), "-7"},
      {PropertyValue::unsigned_integer(~std::uint64_t{0}), "18446744073709551615"},
      {PropertyValue::boolean(false), "false"},
      {PropertyValue::real(2), "2.0"},
      {PropertyValue::real(-0.1), "-0.1"},
      {PropertyValue::real(1e300), "1e+300"},
      {PropertyValue::date(0), "2001-01-01T00:00:00Z"},
      {PropertyValue::date(-978'307'200), "1970-01-01T00:00:00Z"},
      {PropertyValue::date(99'792'000.25), "2004-03-01T00:00:00.250Z"},
      {PropertyValue::date(252'423'993'599), "9999-12-31T23:59:59Z"},
      {PropertyValue::date(1e300), "date 1e+300"},
      {data(""), "<0 bytes>"},
      {data("\x89PNG"), "<89504e47 4 bytes>"},
      {data("0123456789abcdefg"), "<30313233 34353637 38396162 63646566 … 17 bytes>"},
      {array({}), "[]"},
      {dictionary({{"k\"\n", array({"v", 1})}}), R"({"k\"\n": ["v", 1]})"},
  };
  for (const auto& [value, expected] : cases) EXPECT_EQ(described(value), expected);
}

TEST(Description, IsCutBetweenCharacters) {
  for (std::size_t room = 1; room < 12; ++room) {
    char buffer[12];
    TextSink sink(std::span(buffer, room));
    describe(text("aä€😀b"), sink);
    const std::string_view whole = "aä€😀b";
    const std::string_view cut(buffer, static_cast<std::size_t>(sink.position() - buffer));
    EXPECT_TRUE(whole.starts_with(cut));
    EXPECT_EQ(sink.full(), room < whole.size());
    EXPECT_TRUE(PropertyValue::string(cut)) << room;
    EXPECT_GT(cut.size() + 4, room);
  }
}

TEST(Description, EndsQuicklyWhateverTheValue) {
  PropertyValue deep = array({});
  for (int i = 0; i < 100'000; ++i) deep = array({deep});
  PropertyValue fan = array({"x"});
  for (int i = 0; i < 60; ++i) fan = array({fan, fan});
  for (const auto& value : {deep, fan, text(std::string(1 << 20, 'x'))}) {
    char buffer[2048];
    TextSink sink(buffer);
    describe(value, sink);
    EXPECT_LE(sink.position(), buffer + sizeof buffer);
  }
}

}  // namespace
}  // namespace quorvel::test
