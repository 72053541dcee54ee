#include "store/data_ark.h"

#include <gtest/gtest.h>

#include <atomic>
#include <thread>

#include "kept_ark.h"
#include "log/daemon_log.h"
#include "store/data_ark_record.h"
#include "support/scratch_root.h"
#include "support/values.h"

namespace quorvel::test {
namespace {

// A data ark in a root without a data file, with the lines of its load read.
class DataArkTest : public testing::Test {
 protected:
  DataArkTest() {
    root_.make_directory(kStateDirectory);
    ark_ = load_kept_ark();
    static_cast<void>(root_.log_lines());
  }
  std::uint32_t change_count() {
    const LockHold hold(ark_->lock);
    return ark_->change_count;
  }
  int set(const PropertyValue& domain, const PropertyValue& key, const Value& value) {
    return data_ark_set(ark_, domain, key, value.value());
  }

  ScratchRoot root_;
  DataArk* ark_;
};

TEST(DataArkKey, JoinsDomainAndKeyByAHyphen) {
  const struct {
    PropertyValue domain, key;
    std::string_view expected;
  } cases[] = {
      {text("a"), text("b"), "a-b"},
      {text("a"), nullptr, "a-"},
      {nullptr, text("b"), "-b"},
      {nullptr, nullptr, "-"},
      {text(""), text("b"), "-b"},
      {text("a-b"), text("c"), "a-b-c"},
      {PropertyValue::integer(1), text("b"), "-b"},
      {text(std::string(5000, 'd')), text("ä\n"), ""},
  };
  for (const auto& [domain, key, expected] : cases) {
    const std::string whole = expected.empty() ? std::string(5000, 'd') + "-ä\n" : std::string(expected);
    EXPECT_EQ(data_ark_key(domain, key), text(whole));
  }
}

TEST_F(DataArkTest, OnlyChangesOutsideTheExemptClassesCount) {
  const PropertyValue domain = text("com.example");
  for (const unsigned key_class : {0u, 1u, 2u, 3u, 4u, 5u, 6u, 7u, 8u}) {
    const PropertyValue key = text("class" + std::to_string(key_class));
    const std::string name = "com.example-class" + std::to_string(key_class);
    EXPECT_EQ(data_ark_add_to_class(ark_, domain, key, key_class), 0);
    const bool set_counts = key_class != 1 && key_class != 5 && key_class != 7;
    const bool removal_counts = key_class != 1 && key_class != 7;
    std::uint32_t expected = change_count();
    EXPECT_EQ(set(domain, key, "value"), 0);
    EXPECT_EQ(change_count(), expected += set_counts);
    if (set_counts) {
      root_.expect_log({"data_ark_set: dirtied by changing " + name});
    }
    EXPECT_EQ(set(domain, key, "value"), 0) << "an equal value changes nothing";
    EXPECT_EQ(change_count(), expected);
    extended_logging = 1;
    EXPECT_EQ(data_ark_remove_extended(ark_, domain, key, 0), 0);
    EXPECT_EQ(change_count(), expected += removal_counts);
    if (removal_counts) root_.expect_log({"data_ark_remove_extended: dirtied by removing " + name});
    EXPECT_EQ(set(domain, key, "value"), 0) << "the mark has stayed";
    EXPECT_EQ(change_count(), expected += set_counts);
    extended_logging = 0;
    EXPECT_EQ(data_ark_remove(ark_, domain, key), 0);
    EXPECT_EQ(change_count(), expected += removal_counts);
    EXPECT_EQ(set(domain, key, "value"), 0) << "the mark is gone";
    EXPECT_EQ(change_count(), expected + 1);
    static_cast<void>(root_.log_lines());
  }
  EXPECT_EQ(data_ark_add_to_class(ark_, domain, text("k"), 9), -1);
  EXPECT_EQ(data_ark_add_to_class(ark_, domain, text("k"), ~0u), -1);
}

TEST_F(DataArkTest, ANewKeyJoinsTheClassesOfItsDomain) {
  const PropertyValue domain = text("d"), old_key = text("old"), new_key = text("new");
  EXPECT_EQ(set(domain, old_key, 1), 0);
  EXPECT_EQ(data_ark_add_to_class(ark_, domain, nullptr, 1), 0);
  EXPECT_EQ(set(domain, old_key, 2), 0);
  EXPECT_EQ(set(domain, new_key, 3), 0);
  EXPECT_EQ(set(domain, nullptr, 4), 0) << "is in the class itself";
  root_.expect_log({"data_ark_set: dirtied by changing d-old", "data_ark_set: dirtied by changing d-old"});
  data_ark_store(ark_);
  root_.expect_log({"data_ark_store: saved"});
  EXPECT_EQ(root_.read_plist(kDataFile), dictionary({{"d-old", 2}}));
  EXPECT_EQ(data_ark_copy(ark_, domain, new_key), PropertyValue::integer(3));
}

TEST_F(DataArkTest, EdgesAnswerAsDocumented) {
  EXPECT_EQ(data_ark_remove(ark_, nullptr, text("k")), -1) << "no values yet";
  EXPECT_FALSE(data_ark_copy(ark_, nullptr, nullptr));
  EXPECT_EQ(data_ark_set(ark_, nullptr, text("k"), nullptr), -1);
  root_.expect_log({"data_ark_set: data_ark_set: value is NULL"});
  EXPECT_EQ(set(text("a-b"), text("c"), 1), 0);
  EXPECT_EQ(data_ark_exists(ark_, text("a"), text("b-c")), 1);
  EXPECT_EQ(data_ark_exists(ark_, text("a"), text("b")), 0);
  EXPECT_EQ(data_ark_remove(ark_, nullptr, text("k")), 0);
  EXPECT_EQ(data_ark_copy(ark_, text("a"), nullptr), dictionary({{"b-c", 1}}));
  EXPECT_EQ(data_ark_copy(ark_, text("none"), nullptr), dictionary({}));
  EXPECT_EQ(set(nullptr, text("own"), "x\ny"), 0);
  EXPECT_EQ(data_ark_copy(ark_, nullptr, nullptr), dictionary({{"own", "x\ny"}}));
  root_.expect_log({"data_ark_set: dirtied by changing a-b-c", "data_ark_set: dirtied by changing -own"});

  PropertyValue list = array({1});
  EXPECT_EQ(set(nullptr, text("list"), list), 0);
  EXPECT_TRUE(data_ark_copy(ark_, nullptr, text("list")).same_object(list)) << "the maker's own object is stored";
  ASSERT_TRUE(list.append(PropertyValue::integer(2)));
  EXPECT_EQ(data_ark_copy(ark_, nullptr, text("list")), array({1})) << "and does not change behind the store's back";
  const PropertyValue equal = array({1});
  EXPECT_EQ(set(nullptr, text("list"), equal), 0);
  EXPECT_TRUE(data_ark_copy(ark_, nullptr, text("list")).same_object(equal)) << "an equal value replaces it";
  EXPECT_EQ(set(nullptr, text("nan"), __builtin_nan("")), 0);
  EXPECT_EQ(set(nullptr, text("nan"), __builtin_nan("")), 0);
  root_.expect_log({"data_ark_set: dirtied by changing -list", "data_ark_set: dirtied by changing -nan"});
}

TEST_F(DataArkTest, ThreadsSeeWholeValues) {
  root_.ignore_log();
  data_ark_add_to_class(ark_, text("d"), nullptr, 1);
  std::atomic<bool> stop = false;
  std::vector<std::thread> threads;
  for (int t = 0; t < 4; ++t) {
    threads.emplace_back([&, t] {
      for (int i = 0; !stop; ++i) {
        const PropertyValue key = text("key" + std::to_string((i + t) % 50));
        if (i % 7 == 0) {
          data_ark_remove_extended(ark_, text("d"), key, 0);
        } else if (i % 11 == 0) {
          data_ark_store(ark_);
        } else {
          set(text("d"), key, array({i, i}));
        }
        const PropertyValue pair = data_ark_copy(ark_, text("d"), key);
        ASSERT_EQ(pair.at(0), pair.at(1));
        const PropertyValue view = data_ark_copy(ark_, text("d"), nullptr);
        for (const auto& [name, value] : view.entries()) ASSERT_EQ(value.at(0), value.at(1));
      }
    });
  }
  std::this_thread::sleep_for(std::chrono::milliseconds(300));
  stop = true;
  for (auto& thread : threads) thread.join();
}

}  // namespace
}  // namespace quorvel::test
