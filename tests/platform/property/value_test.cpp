#include "platform/property/value.h"

#include <gtest/gtest.h>

#include <map>
#include <random>

#include "support/values.h"

namespace quorvel::test {
namespace {

TEST(Value, ADictionaryAgreesWithAModelThroughManyChanges) {
  std::mt19937 random(7);
  std::map<std::string, int> model;
  PropertyValue value = PropertyValue::dictionary();
  PropertyValue kept;
  for (int step = 0; step < 20'000; ++step) {
    const std::string key = "key" + std::to_string(random() % 300);
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
  const PropertyValue different[] = {PropertyValue::integer(1),
                                     PropertyValue::real(1),
                                     PropertyValue::boolean(true),
                                     PropertyValue::date(1),
                                     text("1"),
                                     data("1"),
                                     array({1}),
                                     dictionary({{"1", 1}}),
                                     PropertyValue::real(0.0),
                                     PropertyValue::real(-0.0),
                                     PropertyValue::integer(-1),
                                     PropertyValue::unsigned_integer(~std::uint64_t{0}),
                                     dictionary({{"1", 2}}),
                                     array({1, 1}),
                                     dictionary({{"2", 1}}),
                                     PropertyValue{}};
  for (std::size_t i = 0; i < std::size(different); ++i) {
    for (std::size_t j = 0; j < std::size(different); ++j) EXPECT_EQ(different[i] == different[j], i == j) << i << j;
  }
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

}  // namespace
}  // namespace quorvel::test
