#include "files/property_list_file.h"

#include <fcntl.h>
#include <sys/resource.h>
#include <sys/stat.h>

#include <fstream>

#include "files/value_helpers.h"
#include "platform/file_system.h"
#include "support/scratch_root.h"

namespace quorvel::test {
namespace {

const std::string kFolder = "/private/var/mobile";
const std::string kFile = kFolder + "/file.plist";

class PropertyListFile : public testing::Test {
 protected:
  PropertyListFile() {
    ::umask(022);
    root.set_mode(kFolder, 0755);
  }

  std::string info(const std::string& path, const std::string& mode) const {
    return "log_file_info: stat " + path + " uid=" + std::to_string(::getuid()) + " gid=" + std::to_string(::getgid()) +
           " p=" + mode;
  }

  ScratchRoot root;
};

PropertyValue sample() {
  return dictionary({{"array", array({1, -2.5, true, "text"})},
                     {"nested", dictionary({{"data", data("\1\2\3")}, {"date", PropertyValue::date(86400.25)}})},
                     {"largest", UINT64_MAX}});
}

int store_whole_durably(const char* path, const PropertyValue& value) noexcept {
  return store_dict_durably(path, value, {});
}

TEST_F(PropertyListFile, WhatIsStoredIsLoadedEqual) {
  for (const auto store : {store_dict, store_whole_durably}) {
    for (const PropertyValue& value : {sample(), array({"root"}), text("root"), dictionary({})}) {
      ASSERT_EQ(store(kFile.c_str(), value), 0);
      EXPECT_EQ(root.read_file(kFile).substr(0, 8), "bplist00");
      EXPECT_EQ(load_dict(kFile.c_str()), value);
      EXPECT_EQ(load_mutable_dict(kFile.c_str()), value);
      EXPECT_FALSE(load_dict(kFile.c_str()).is_mutable());
      EXPECT_EQ(load_mutable_dict(kFile.c_str()).is_mutable(), value.is_container());
    }
  }
  EXPECT_EQ(root.mode_of(kFile), 0644u);
  // A durable store makes a new file, whatever stood there; another name of that keeps its content and mode.
  root.set_mode(kFile, 0600);
  root.write_file(kFile, "linked");
  std::filesystem::create_hard_link(root.path(kFile), root.path(kFolder + "/other"));
  ASSERT_EQ(store_whole_durably(kFile.c_str(), sample()), 0);
  EXPECT_EQ(root.read_file(kFolder + "/other"), "linked");
  EXPECT_EQ(root.mode_of(kFile), 0644u);
  root.set_mode(kFile, 0600);
  EXPECT_EQ(store_dict(kFile.c_str(), array({})), 0);
  EXPECT_EQ(root.mode_of(kFile), 0600u);
  EXPECT_EQ(root.read_plist(kFile), array({}));
}

TEST_F(PropertyListFile, ALoadThatFailsSaysWhy) {
  const auto unopened = [&](const std::string& refusal, const std::string& path, const std::string& mode) {
    EXPECT_FALSE(load_dict(path.c_str()));
    const std::vector<std::string> lines = root.log_lines();
    ASSERT_EQ(lines.size(), 4u);
    EXPECT_EQ(lines[0], "_safe_open: " + refusal);
    EXPECT_TRUE(lines[1].starts_with("_load_dict: Could not open " + path + ": ")) << lines[1];
    EXPECT_EQ(lines[2],
              mode.empty() ? "log_file_info: Can't stat " + path + ": No such file or directory" : info(path, mode));
    EXPECT_EQ(lines[3], info(kFolder, "40755"));
  };
  root.make_directory(kFolder + "/directory");
  root.write_plist(kFolder + "/target", sample());
  root.make_link("target", kFolder + "/link");
  unopened("open(" + kFile + ") failed: No such file or directory", kFile, "");
  unopened(kFolder + "/directory type is 16384, not 32768", kFolder + "/directory", "40755");
  unopened("open(" + kFolder + "/link) failed: Too many levels of symbolic links", kFolder + "/link", "100644");

  const std::size_t open_before = descriptors_open();
  for (const std::string content : {"", "bplist00", "<?xml version=\"1.0\"?>"}) {
    root.write_file(kFile, content);
    EXPECT_FALSE(load_dict(kFile.c_str()));
    root.expect_log({"_load_dict: Could not create dictionary from stream"});
  }
  // A gigabyte of zeros, one with a header, and one whose trailer tells of a table beyond its end.
  std::string trailer(32, '\0');
  trailer[6] = trailer[7] = trailer[15] = '\1';
  trailer[27] = '\x50';
  const std::pair<std::string, std::string> ends[] = {{"<?xml", ""}, {"bplist00", ""}, {"bplist00", trailer}};
  for (const auto& [first, last] : ends) {
    root.write_file(kFile, first);
    std::filesystem::resize_file(root.path(kFile), (1 << 30) - last.size());
    std::ofstream(root.path(kFile), std::ofstream::binary | std::ofstream::app) << last;
    EXPECT_FALSE(load_dict(kFile.c_str()));
    root.expect_log({"_load_dict: Could not create dictionary from stream"});
  }
  rusage used{};
  ASSERT_EQ(::getrusage(RUSAGE_SELF, &used), 0);
  EXPECT_LT(used.ru_maxrss, 1 << 19) << "its first and last bytes are enough";
  const PropertyValue large = test::dictionary({{"large", test::data(std::string((64u << 20) + 1, 'x'))}});
  root.write_plist(kFile, large);
  EXPECT_TRUE(load_dict(kFile.c_str()) == large);
  std::filesystem::resize_file(root.path(kFile), 0x7ffff001);
  EXPECT_FALSE(load_mutable_dict(kFile.c_str()));
  root.expect_log({"_load_dict: too big for our purposes"});
  EXPECT_EQ(descriptors_open(), open_before);
}

TEST_F(PropertyListFile, AFileThatChangesMeanwhileIsReadOnceMore) {
  // Reading it takes long enough for a change to fall into.
  const PropertyValue large = test::data(std::string(16u << 20, 'x'));
  root.write_plist(kFile, large);
  std::atomic<bool> done = false;
  std::thread toucher([&] {
    const std::string path = root.path(kFile);
    for (time_t time = 0; !done; ++time) {
      const timespec times[] = {{time, 0}, {time, 0}};
      ::utimensat(AT_FDCWD, path.c_str(), times, 0);
    }
  });
  for (int i = 0; i < 4; ++i) EXPECT_TRUE(load_dict(kFile.c_str()) == large);
  done = true;
  toucher.join();
}

TEST_F(PropertyListFile, AStoreThatFailsSaysWhyAndHarmsNothing) {
  root.write_file(kFolder + "/target", "content");
  root.make_link("target", kFolder + "/link");
  const std::string link = kFolder + "/link";
  EXPECT_EQ(store_dict(link.c_str(), sample()), -1);
  EXPECT_EQ(root.read_file(kFolder + "/target"), "content");
  root.expect_log({"_safe_open: open(" + link + ") failed: Too many levels of symbolic links",
                   "store_dict: Could not create " + link + ": Too many levels of symbolic links", info(link, "100644"),
                   info(kFolder, "40755")});

  // What cannot be encoded is found out before the file is touched.
  root.write_file(kFile, "content");
  EXPECT_EQ(store_dict(kFile.c_str(), PropertyValue()), -1);
  root.expect_log({"store_dict: Could not serialize dictionary to stream"});
  EXPECT_EQ(root.read_file(kFile), "content");

  std::signal(SIGXFSZ, SIG_IGN);
  const rlimit limit{65536, RLIM_INFINITY};
  ASSERT_EQ(::setrlimit(RLIMIT_FSIZE, &limit), 0);
  for (const auto store : {store_dict, store_whole_durably}) {
    EXPECT_EQ(store(kFile.c_str(), text(std::string(100'000, 'x'))), -1);
    root.expect_log({"store_dict: Could not write to " + kFile + ": File too large", info(kFile, "100644"),
                     info(kFolder, "40755")});
  }
  EXPECT_EQ(root.read_file(kFile).size(), 65536u);
}

TEST(MakeMutable, EndsTheProcessForEveryOtherKind) {
  ScratchRoot root;
  EXPECT_TRUE(make_mutable(data("x")).is_mutable());
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

}  // namespace
}  // namespace quorvel::test
