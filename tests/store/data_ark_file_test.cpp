#include <gtest/gtest.h>

#include "kept_ark.h"
#include "log/daemon_log.h"
#include "store/data_ark.h"
#include "store/standard_key_classes.h"
#include "support/scratch_root.h"
#include "support/values.h"

namespace quorvel::test {
namespace {

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
  EXPECT_EQ(lines[0], "_safe_open: open(" + kTemporary + ") failed: Is a directory");
  EXPECT_EQ(lines[1], "store_dict: Could not create " + kTemporary + ": Is a directory");
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

TEST(DataArkFile, AFileThatCouldNotBeUsedIsNeverDestroyed) {
  const struct {
    const char* name;
    void (*put)(ScratchRoot&);
  } cases[] = {
      {"garbage", [](ScratchRoot& root) { root.write_file(kFile, "garbage"); }},
      {"empty", [](ScratchRoot& root) { root.write_file(kFile, ""); }},
      {"another root", [](ScratchRoot& root) { root.write_plist(kFile, array({1})); }},
      {"directory", [](ScratchRoot& root) { root.make_directory(kFile); }},
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
    const std::string content = std::string(name) == "directory" ? "" : root.read_file(kFile);
    DataArk* ark = load_kept_ark();
    EXPECT_EQ(root.log_lines().back(), "data_ark_load: Could not load " + kFile) << name;
    data_ark_store(ark);
    EXPECT_EQ(root.log_lines().back(), "data_ark_store: " + kFile + " could not be loaded, left it where it is");
    EXPECT_TRUE(root.exists(kFile)) << name;
    if (std::string(name) == "directory") root.remove(kSetAside);
    data_ark_set(ark, nullptr, text("new"), text("x"));
    data_ark_store(ark);
    const auto lines = root.log_lines();
    ASSERT_GE(lines.size(), 2u);
    EXPECT_EQ(lines[1], "data_ark_store: " + kFile + " could not be loaded, set it aside as " + kSetAside) << name;
    EXPECT_EQ(root.read_plist(kFile), dictionary({{"-new", "x"}})) << name;
    ASSERT_TRUE(root.exists(kSetAside)) << name;
    EXPECT_TRUE(std::string(name) == "directory" || root.read_file(kSetAside) == content) << name;
  }
}

TEST(DataArkFile, AMissingFileIsOneLineAndNothingElse) {
  ScratchRoot root;
  root.make_directory(kStateDirectory);
  DataArk* ark = load_kept_ark();
  EXPECT_EQ(root.log_lines().back(), "data_ark_load: Could not load " + kFile);
  data_ark_store(ark);
  EXPECT_FALSE(root.exists(kFile));
  root.expect_log({});
}

}  // namespace
}  // namespace quorvel::test
