#include <random>

#include "property/description.h"
#include "support/values.h"

namespace quorvel::test {
namespace {

TEST(Value, ADictionaryAgreesWithAModelThroughManyChanges) {
  std::mt19937 random(7);
  std::map<std::string, int> model;
  PropertyValue value = PropertyValue::dictionary();
  PropertyValue kept;
  for (int step = 0; step < 20'000; ++step) {
    const auto which = random() % 300;
    const std::string key = "key" + std::to_string(which) + std::string(which % 50, '.');
    if (random() % 3 == 0) {
      EXPECT_EQ(static_cast<bool>(value.remove(key)), model.erase(key) == 1);
    } else {
      const int number = static_cast<int>(random() % 1000);
      ASSERT_TRUE(value.set(key, PropertyValue::integer(number)));
      model[key] = number;
    }
    if (step % 1000 == 0) kept = value;  // from now on the dictionary is shared, and copied before it changes
    if (step % 100 != 0) continue;
    ASSERT_EQ(value.size(), model.size());
    std::size_t seen = 0;
    for (const auto& [k, v] : value.entries()) {
      ASSERT_EQ(model.at(std::string(k.text())), v.to_int64());
      ++seen;
    }
    ASSERT_EQ(seen, model.size());
    for (const auto& [k, number] : model) ASSERT_EQ(value.get(k).to_int64(), number);
  }
}

TEST(Value, AChangeIsSeenOnlyThroughTheValueItWasMadeThrough) {
  PropertyValue maker = dictionary({{"a", 1}});
  const PropertyValue stored = maker;
  ASSERT_TRUE(maker.set("a", PropertyValue::integer(2)));
  EXPECT_EQ(stored, dictionary({{"a", 1}}));
  ASSERT_TRUE(maker.set("self", maker));
  EXPECT_EQ(maker, dictionary({{"a", 2}, {"self", dictionary({{"a", 2}})}}));

  PropertyValue bytes = data("abc").mutable_copy();
  const PropertyValue before = bytes;
  bytes.mutable_bytes()[0] = std::byte{'x'};
  EXPECT_EQ(before, data("abc"));
  EXPECT_EQ(bytes, data("xbc"));
  EXPECT_TRUE(data("abc").mutable_copy().is_mutable());
  EXPECT_FALSE(text("abc").mutable_copy());
}

TEST(Value, EntriesKeepTheirOrder) {
  PropertyValue value = dictionary({{"c", 1}, {"a", 2}, {"b", 3}});
  ASSERT_TRUE(value.remove("a"));
  ASSERT_TRUE(value.set("c", PropertyValue::integer(9)));
  ASSERT_TRUE(value.set("a", PropertyValue::integer(4)));
  EXPECT_EQ(described(value), R"({"c": 9, "b": 3, "a": 4})");
}

TEST(Value, EqualityLooksAtKindAndContent) {
  const PropertyValue one = PropertyValue::integer(1), most = PropertyValue::unsigned_integer(~std::uint64_t{0});
  const Value different[] = {one, 1.0, true, "1", 0.0, -0.0, -1, most, data("1"), array({1}), array({1, 1})};
  std::vector<PropertyValue> values = {PropertyValue{}, PropertyValue::date(1), dictionary({{"1", 1}}),
                                       dictionary({{"1", 2}}), dictionary({{"2", 1}})};
  for (const Value& value : different) values.push_back(value.value());
  for (std::size_t i = 0; i < values.size(); ++i)
    for (std::size_t j = 0; j < values.size(); ++j) EXPECT_EQ(values[i] == values[j], i == j) << i << ' ' << j;
  EXPECT_EQ(dictionary({{"a", 1}, {"b", 2}}), dictionary({{"b", 2}, {"a", 1}}));
  EXPECT_EQ(PropertyValue::real(__builtin_nan("")), PropertyValue::real(__builtin_nan("")));
}

TEST(Value, RefusesWhatItCannotHold) {
  EXPECT_FALSE(PropertyValue::string("\xff"));
  EXPECT_FALSE(PropertyValue::string("\xed\xa0\x80")) << "a surrogate";
  EXPECT_FALSE(PropertyValue::string("\xc0\x80")) << "overlong";
  PropertyValue value = dictionary({});
  EXPECT_FALSE(value.set("key", nullptr));
  EXPECT_FALSE(value.set(PropertyValue::integer(1), PropertyValue::integer(1)));
  EXPECT_FALSE(value.append(PropertyValue::integer(1)));
  EXPECT_FALSE(text("a").set("b", PropertyValue::integer(1)));
  EXPECT_EQ(value.size(), 0u);
}

TEST(Description, IsOneLineThatAReaderUnderstands) {
  const struct {
    PropertyValue value;
    std::string_view expected;
  } cases[] = {
      {nullptr, "(null)"},
      {text("Gerät"), "Gerät"},
      {text("a\nb\r\t\x1b[2J\x7f"), "a\\nb\\r\\t\\x1b[2J\\x7f"},
      {text("\u0085\u2028"), "\\xc2\\x85\\xe2\\x80\\xa8"},
      {text("\u202ea\u200b\ufeff\U000e0041\u00a0é😀"),
       "\\xe2\\x80\\xaea\\xe2\\x80\\x8b\\xef\\xbb\\xbf\\xf3\\xa0\\x81\\x81\u00a0é😀"},
      {text(std::string_view("nul\0", 4)), "nul\\x00"},
      {text("100%s \"q\""), "100%s \"q\""},
      {PropertyValue::integer(-7), "-7"},
      {PropertyValue::unsigned_integer(~std::uint64_t{0}), "18446744073709551615"},
      {PropertyValue::boolean(false), "false"},
      {PropertyValue::real(2), "2.0"},
      {PropertyValue::real(-0.1), "-0.1"},
      {PropertyValue::real(1e300), "1e+300"},
      {PropertyValue::real(0.1 + 0.2), "0.30000000000000004"},
      {PropertyValue::real(5e-324), "4.94065645841247e-324"},
      {PropertyValue::date(0), "2001-01-01T00:00:00Z"},
      {PropertyValue::date(-978'307'200), "1970-01-01T00:00:00Z"},
      {PropertyValue::date(99'792'000.25), "2004-03-01T00:00:00.250Z"},
      {PropertyValue::date(252'423'993'599), "9999-12-31T23:59:59Z"},
      {PropertyValue::date(-63'145'526'400), "0000-01-01T00:00:00Z"},
      {PropertyValue::date(-63'145'526'401), "date -63145526401.0"},
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

}  // namespace
}  // namespace quorvel::test
