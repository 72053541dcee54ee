#include "files/value_helpers.h"

#include <gtest/gtest.h>

#include <string>
#include <utility>
#include <vector>

#include "platform/file_system.h"
#include "support/scratch_root.h"
#include "support/values.h"

namespace quorvel::test {
namespace {

TEST(MakeMutable, TakesThePlaceOfADictionaryOrData) {
  const PropertyValue source = dictionary({{"a", 1}, {"b", array({"shared"})}});
  PropertyValue copy = make_mutable(source);
  EXPECT_EQ(copy, source);
  EXPECT_TRUE(copy.get("b").same_object(source.get("b")));
  EXPECT_TRUE(copy.set("c", text("new")));
  EXPECT_EQ(source.size(), 2u);

  PropertyValue bytes = make_mutable(data("\1\2"));
  ASSERT_EQ(bytes.mutable_bytes().size(), 2u);
  bytes.mutable_bytes()[0] = std::byte{7};
  EXPECT_EQ(bytes, data("\7\2"));
}

TEST(MakeMutable, EndsTheProcessForEveryOtherKind) {
  ScratchRoot root;
  for (const PropertyValue& value : {text("a"), PropertyValue::integer(1), array({}), PropertyValue()}) {
    EXPECT_EXIT(static_cast<void>(make_mutable(value)), testing::ExitedWithCode(255), "We are dead!");
    root.expect_log({"make_mutable: Could not create mutable copy! We are dead!"});
  }
}

TEST(DictForEach, MeetsEachEntryOnceWhateverTheCallbackDoes) {
  struct Meeting {
    PropertyValue dictionary = test::dictionary({{"a", 1}, {"b", "two"}, {"c", 3}});
    std::vector<std::string> met;
  } meeting;
  const auto meet = [](const PropertyValue& key, const PropertyValue& value, void* context) noexcept {
    auto& state = *static_cast<Meeting*>(context);
    state.met.push_back(std::string(key.text()) + "=" + described(value));
    static_cast<void>(state.dictionary.remove("b"));
    static_cast<void>(state.dictionary.remove("c"));
    EXPECT_TRUE(state.dictionary.set("new " + std::string(key.text()), PropertyValue::integer(0)));
  };
  dict_for_each(meeting.dictionary, meet, &meeting);
  EXPECT_EQ(meeting.met, (std::vector<std::string>{"a=1", "b=two", "c=3"}));
  EXPECT_EQ(described(meeting.dictionary.get("b")), "(null)");
  EXPECT_EQ(meeting.dictionary.size(), 4u);
  meeting.met.clear();
  dict_for_each(dictionary({}), meet, &meeting);
  EXPECT_TRUE(meeting.met.empty());
}

TEST(ValueHelpers, TellStringsAndTheHome) {
  const PropertyValue string = text("text");
  EXPECT_EQ(&as_string(string), &string);
  for (const PropertyValue& value : {PropertyValue(), PropertyValue::integer(1), dictionary({})}) {
    EXPECT_FALSE(as_string(value));
  }
  PropertyValue released = string;
  release_if_not_null(released);
  EXPECT_FALSE(released);
  release_if_not_null(released);
  char home[platform::kPathSize];
  mobile_home_path(home);
  EXPECT_STREQ(home, "/private/var/mobile");
}

}  // namespace
}  // namespace quorvel::test
