#include "store/data_ark.h"

#include <sys/resource.h>

#include "log/daemon_log.h"
#include "platform/process.h"
#include "quorvel/observer.h"
#include "store/data_ark_record.h"
#include "store/standard_key_classes.h"
#include "support/scratch_root.h"

namespace quorvel::test {

// Loads a data ark that the process keeps to its end, as the daemon does.
DataArk* load_kept_ark() {
  static auto& arks = *new std::vector<DataArk*>;
  return arks.emplace_back(data_ark_load());
}

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
    if (set_counts) root_.expect_log({"data_ark_set: dirtied by changing " + name});
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
  for (const char* domain : {"com.example.a", "com.example.b", "org.example.a"}) {
    EXPECT_EQ(set(text(domain), text("k"), domain), 0);
    EXPECT_EQ(data_ark_copy(ark_, text(domain), nullptr), dictionary({{"k", domain}}));
  }
  EXPECT_EQ(root_.log_lines().size(), 3u);

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

TEST(RegisteredNotifications, ArePostedForTheirEventsOnly) {
  ScratchRoot root;
  root.ignore_log();
  root.make_directory(kStateDirectory);
  ASSERT_EQ(platform::start_process(), 0);
  DataArk* ark = load_kept_ark();
  client::Observer observer;
  ASSERT_FALSE(observer.connect());
  const auto heard = [&] {
    post_system_notification(text("end"));
    std::vector<std::string> names;
    client::Event event;
    while (!observer.next(event, kPatience) && event.name != "end") names.push_back(event.name);
    return names;
  };
  using Names = std::vector<std::string>;
  const PropertyValue domain = text("d"), key = text("k");
  const auto set = [&](const PropertyValue& name, int value) {
    EXPECT_EQ(data_ark_set(ark, domain, name, PropertyValue::integer(value)), 0);
  };
  set(key, 1);
  EXPECT_EQ(heard(), Names{}) << "nobody has registered";
  EXPECT_EQ(data_ark_register_notification(ark, domain, key, text("key set"), kEventSet | kEventRemoved), 0);
  EXPECT_EQ(data_ark_register_notification(ark, domain, key, text("key changed"), kEventChanged), 0);
  EXPECT_EQ(data_ark_register_notification(ark, domain, nullptr, text("domain"), kEventSet | kEventChanged), 0);
  EXPECT_EQ(data_ark_register_notification(ark, domain, key, text("never"), 0), 0);
  set(key, 2);
  EXPECT_EQ(heard(), (Names{"key changed", "domain", "key set", "domain"}));
  set(key, 2);
  EXPECT_EQ(heard(), (Names{"key set", "domain"}));
  set(text("other"), 1);
  EXPECT_EQ(heard(), (Names{"domain", "domain"}));
  EXPECT_EQ(data_ark_register_notification(ark, domain, key, text("key gone"), kEventRemoved), 0);
  EXPECT_EQ(data_ark_remove(ark, domain, key), 0);
  EXPECT_EQ(data_ark_remove(ark, domain, key), 0);
  EXPECT_EQ(heard(), Names{"key gone"}) << "a later name replaces an earlier one, and only what is there is removed";
  EXPECT_EQ(data_ark_exists(ark, domain, key), 0);
}

const std::string kTemporary = std::string(kDataFile) + ".XXXXXX";
const std::string kSetAside = std::string(kDataFile) + ".unreadable";
const std::string kFile = kDataFile;

TEST(DataArkFile, HoldsWhatIsNeitherInClassOneNorSeven) {
  ScratchRoot root;
  root.write_plist(kFile, dictionary({{"-PhoneNumber", "1"},
                                      {"-DebugDockPresent", true},
                                      {"-kept", array({1, 2})},
                                      {"com.Orvane.mobile.halvard.paired_hosts-old", "host"}}));
  DataArk* ark = load_kept_ark();
  apply_standard_key_classes(ark);
  EXPECT_EQ(data_ark_copy(ark, nullptr, text("PhoneNumber")), text("1")) << "what is not saved again can be read";
  EXPECT_EQ(data_ark_copy(ark, text("com.Orvane.mobile.backup"), text("Version")), text("2.0"));
  data_ark_set(ark, text("com.Orvane.mobile.halvard.paired_hosts"), text("new"), text("host"));
  data_ark_store(ark);
  EXPECT_EQ(root.read_plist(kFile),
            dictionary({{"-kept", array({1, 2})}, {"com.Orvane.mobile.halvard.paired_hosts-old", "host"}}));
  EXPECT_EQ(root.mode_of(kFile), 0644u);
  EXPECT_FALSE(root.exists(kTemporary));
  root.expect_log({"data_ark_store: saved"});
  extended_logging = 0;
  data_ark_remove(ark, nullptr, text("kept"));
  data_ark_remove(ark, text("com.Orvane.mobile.halvard.paired_hosts"), text("old"));
  data_ark_store(ark);
  EXPECT_FALSE(root.exists(kFile)) << "nothing is left to save";
}

TEST(DataArkFile, AFailedSaveLeavesTheFileAndIsTold) {
  ScratchRoot root;
  const PropertyValue before = dictionary({{"-kept", 1}});
  root.write_plist(kFile, before);
  DataArk* ark = load_kept_ark();
  data_ark_set(ark, nullptr, text("new"), text("x"));
  root.expect_log({"data_ark_set: dirtied by changing -new"});
  root.make_directory(kTemporary);
  data_ark_store(ark);
  const auto lines = root.log_lines();
  ASSERT_EQ(lines.size(), 5u);
  EXPECT_EQ(lines[0], "_safe_open: open(" + kTemporary + ") failed: File exists");
  EXPECT_EQ(lines[1], "store_dict: Could not create " + kTemporary + ": File exists");
  EXPECT_EQ(lines[4], "data_ark_store: Could not store " + kTemporary);
  EXPECT_EQ(root.read_plist(kFile), before);
  root.remove(kTemporary);
  root.remove(kFile);
  root.make_directory(kFile);
  data_ark_store(ark);
  root.expect_log({"data_ark_store: Problem renaming " + kTemporary + ": Is a directory"});
  EXPECT_EQ(root.read_plist(kTemporary), dictionary({{"-kept", 1}, {"-new", "x"}}));
  root.remove(kFile);
  data_ark_store(ark);
  EXPECT_EQ(root.read_plist(kFile), dictionary({{"-kept", 1}, {"-new", "x"}}));
  root.expect_log({"data_ark_store: saved"});
}

TEST(DataArkFile, WhatStandsAtTheTemporaryNameIsReplaced) {
  ScratchRoot root;
  root.ignore_log();
  const PropertyValue before = dictionary({{"-kept", 1}}), after = dictionary({{"-kept", 1}, {"-new", "x"}});
  const struct {
    const char* name;
    void (*put)(ScratchRoot&);
  } squatters[] = {
      {"link to the data file", [](ScratchRoot& r) { r.make_link("data_ark.plist", kTemporary); }},
      {"FIFO", [](ScratchRoot& r) { r.make_fifo(kTemporary); }},
      {"file of another mode", [](ScratchRoot& r) { r.write_file(kTemporary, "x"), r.set_mode(kTemporary, 0600); }},
      {"hard link", [](ScratchRoot& r) { std::filesystem::create_hard_link(r.path(kFile), r.path(kTemporary)); }},
  };
  for (const auto& [name, put] : squatters) {
    if (root.exists(kFile)) root.remove(kFile);
    root.write_plist(kFile, before);
    DataArk* ark = load_kept_ark();
    data_ark_set(ark, nullptr, text("new"), text("x"));
    put(root);
    std::filesystem::create_hard_link(root.path(kFile), root.outside() / name);
    data_ark_store(ark);
    EXPECT_EQ(root.read_plist(kFile), after) << name;
    EXPECT_EQ(root.mode_of(kFile), 0644u) << name;
    EXPECT_FALSE(root.exists(kTemporary)) << name;
    EXPECT_EQ(std::filesystem::file_size(root.outside() / name), encoded(before).size()) << name;
  }
  // A save that runs out of room leaves no half of a file behind, and a full disk takes no line about it either.
  DataArk* ark = load_kept_ark();
  data_ark_set(ark, nullptr, text("large"), text(std::string(100'000, 'x')));
  std::signal(SIGXFSZ, SIG_IGN);
  root.write_file(kLogFile, std::string(70'000, '.'));
  const rlimit limit{65536, RLIM_INFINITY};
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &limit), 0);
  testing::internal::CaptureStderr();
  data_ark_store(ark);
  EXPECT_TRUE(testing::internal::GetCapturedStderr().ends_with("data_ark_store: the data ark could not be saved\n"));
  EXPECT_FALSE(root.exists(kTemporary));
  EXPECT_EQ(root.read_plist(kFile), after);
}

TEST_F(DataArkTest, AValueThatNoSaveCouldWriteIsRefused) {
  const auto nested = [](int depth) {
    PropertyValue value = PropertyValue::array();
    for (int i = 1; i < depth; ++i) value = array({value});
    return value;
  };
  EXPECT_EQ(set(nullptr, text("deepest"), nested(511)), 0);
  EXPECT_EQ(set(nullptr, text("deeper"), nested(512)), -1);
  EXPECT_EQ(data_ark_exists(ark_, nullptr, text("deeper")), 0);
  data_ark_store(ark_);
  root_.expect_log({"data_ark_set: dirtied by changing -deepest",
                    "data_ark_set: value of -deeper is nested too deep or repeats too much to be saved",
                    "data_ark_store: saved"});
  EXPECT_EQ(data_ark_register_notification(ark_, nullptr, text("k"), nullptr, kEventSet), -1);
}

TEST(DataArkFile, AFileThatCouldNotBeUsedIsNeverDestroyed) {
  const struct {
    const char* name;
    void (*put)(ScratchRoot&);
  } cases[] = {
      {"garbage", [](ScratchRoot& root) { root.write_file(kFile, "garbage"); }},
      {"empty", [](ScratchRoot& root) { root.write_file(kFile, ""); }},
      {"another root", [](ScratchRoot& root) { root.write_plist(kFile, array({1})); }},
      {"directory", [](ScratchRoot& root) { root.make_directory(kFile); }},
      {"dangling link", [](ScratchRoot& root) { root.make_link("/nowhere", kFile); }},
      {"link",
       [](ScratchRoot& root) {
         root.write_plist("/private/var/mobile/elsewhere", dictionary({{"-a", 1}}));
         root.make_link("../../elsewhere", kFile);
       }},
  };
  ScratchRoot root;
  for (const auto& [name, put] : cases) {
    if (root.exists(kStateDirectory)) root.remove(kStateDirectory);
    root.make_directory(kStateDirectory);
    root.write_file(kSetAside, "older");
    put(root);
    const bool is_readable = std::filesystem::is_regular_file(root.path(kFile));
    const std::string content = is_readable ? root.read_file(kFile) : "";
    DataArk* ark = load_kept_ark();
    EXPECT_EQ(root.log_lines().back(), "data_ark_load: Could not load " + kFile) << name;
    data_ark_store(ark);
    EXPECT_EQ(root.log_lines().back(), "data_ark_store: " + kFile + " could not be loaded, left it where it is");
    EXPECT_TRUE(root.exists(kFile)) << name;
    data_ark_set(ark, nullptr, text("new"), text("x"));
    data_ark_store(ark);
    const auto lines = root.log_lines();
    ASSERT_GE(lines.size(), 2u);
    EXPECT_EQ(lines[1], "data_ark_store: " + kFile + " could not be loaded, set it aside as " + kSetAside) << name;
    EXPECT_EQ(root.read_plist(kFile), dictionary({{"-new", "x"}})) << name;
    ASSERT_TRUE(root.exists(kSetAside)) << name;
    EXPECT_TRUE(!is_readable || root.read_file(kSetAside) == content) << name;
  }
  for (const bool is_gone : {true, false}) {
    root.write_file(kFile, "garbage");
    DataArk* ark = load_kept_ark();
    data_ark_set(ark, nullptr, text("new"), text("x"));
    root.remove(kSetAside);
    root.make_directory(kSetAside + "/full");
    if (is_gone) root.remove(kFile);
    static_cast<void>(root.log_lines());
    data_ark_store(ark);
    const std::string refusal =
        "data_ark_store: Could not set " + kFile + " aside as " + kSetAside + ": Is a directory";
    root.expect_log({is_gone ? "data_ark_store: saved" : refusal});
    EXPECT_EQ(root.read_file(kFile) == "garbage", !is_gone);
  }
}

}  // namespace quorvel::test
