// Paths are resolved inside the device root, whatever links and dots they go through; and the small sources there:
// preferences, device information and the hardware registry.
#include "platform/descriptor.h"
#include "platform/device_information.h"
#include "platform/file_system.h"
#include "platform/hardware_registry.h"
#include "platform/preferences.h"
#include "support/scratch_root.h"

namespace quorvel::test {
namespace {

using namespace platform;

std::string reported_path(const Descriptor& object) {
  char path[kPathSize];
  return descriptor_path(object.get(), path, sizeof path) == 0 ? path : std::strerror(errno);
}

std::string path_after_opening(const std::string& path, int flags = O_RDONLY) {
  const Descriptor object(open_file(path.c_str(), flags, 0));
  return object ? reported_path(object) : std::strerror(errno);
}

TEST(DeviceRoot, ResolvesPathsInside) {
  ScratchRoot root;
  root.write_file("/a/file", "inside");
  root.write_file("/a/really (deleted)", "");
  root.make_link("/a", "/absolute");
  root.make_link("../../../../a", "/upwards");
  root.make_link(root.path("/a").string(), "/outwards");
  root.make_link("/loop", "/loop");
  const std::string missing = std::strerror(ENOENT);
  const struct {
    const char* path;
    std::string expected;
  } cases[] = {
      {"/a/file", "/a/file"},
      {"/", "/"},
      {"/..", "/"},
      {"/../../a/./file", "/a/file"},
      {"//a//file", "/a/file"},
      {"/absolute/file", "/a/file"},
      {"/upwards/file", "/a/file"},
      {"/outwards/file", missing},
      {"/loop/file", std::strerror(ELOOP)},
      {"/a/file/", std::strerror(ENOTDIR)},
      {"/a/really (deleted)", "/a/really (deleted)"},
      {"", missing},
  };
  EXPECT_EQ(path_after_opening("/a"), "/a");  // the root itself stays open from here on
  const std::size_t open_before = descriptors_open();
  for (const auto& c : cases) EXPECT_EQ(path_after_opening(c.path), c.expected) << c.path;
  EXPECT_EQ(descriptors_open(), open_before);
}

TEST(DeviceRoot, MakesRenamesAndRemovesEntriesInside) {
  ScratchRoot root;
  root.make_directory("/a");
  root.make_link("/a", "/absolute");
  EXPECT_EQ(make_directory("/absolute/../../a/made/", 0700), 0);
  EXPECT_EQ(root.mode_of("/a/made"), 0700u);
  EXPECT_EQ(make_directory("/", 0700), -1);
  EXPECT_EQ(errno, EEXIST);
  root.write_file("/a/file", "x");
  struct stat status;
  EXPECT_EQ(file_status("/absolute/file", &status), 0);
  EXPECT_EQ(status.st_size, 1);
  EXPECT_EQ(rename_file("/absolute/file", "/absolute/made/file"), 0);
  EXPECT_TRUE(root.exists("/a/made/file"));
  EXPECT_EQ(remove_file("/absolute"), 0);
  EXPECT_FALSE(root.exists("/absolute"));
  EXPECT_TRUE(root.exists("/a/made/file"));
  EXPECT_EQ(remove_file(""), -1);
  EXPECT_EQ(errno, ENOENT);
  const Descriptor made(open_file("/a/new", O_WRONLY | O_CREAT | O_EXCL, 0640));
  EXPECT_TRUE(made);
  EXPECT_EQ(root.mode_of("/a/new"), 0640u);
  EXPECT_EQ(flush_directory("/a"), 0);
}

TEST(DeviceRoot, ReportsTheNameThatAnObjectWasOpenedUnder) {
  ScratchRoot root;
  for (const char* name : {"/file", "/file (deleted)"}) {
    root.write_file(name, "old");
    const Descriptor replaced(open_file(name, O_RDONLY, 0));
    root.write_file("/next", "new");
    ASSERT_EQ(rename_file("/next", name), 0);
    EXPECT_EQ(reported_path(replaced), name);
    const Descriptor removed(open_file(name, O_RDONLY, 0));
    ASSERT_EQ(remove_file(name), 0);
    EXPECT_EQ(reported_path(removed), name);
  }
}

TEST(DeviceRoot, NeverReportsACutPathOrOneOutside) {
  ScratchRoot root(std::string(200, 'r') + "/" + std::string(200, 'o'));
  root.write_file("/name", "");
  const Descriptor file(open_file("/name", O_RDONLY, 0));
  char path[6];
  EXPECT_EQ(descriptor_path(file.get(), path, 6), 0);
  EXPECT_STREQ(path, "/name");
  EXPECT_EQ(descriptor_path(file.get(), path, 5), -1);
  EXPECT_EQ(errno, ENAMETOOLONG);
  const Descriptor outside(::open(root.outside().c_str(), O_RDONLY | O_CLOEXEC));
  EXPECT_EQ(reported_path(outside), std::strerror(ENOENT));
  // A sibling whose name merely begins like the root's.
  const std::string sibling = root.path().string() + "x";
  const Descriptor beside(::open(sibling.c_str(), O_WRONLY | O_CREAT | O_CLOEXEC, 0600));
  EXPECT_EQ(reported_path(beside), std::strerror(ENOENT));
}

using namespace platform;

constexpr const char* kPreferences = "/private/var/mobile/Library/Preferences/com.example.plist";
constexpr const char* kAnswers = "/etc/quorvel/device_information.plist";

TEST(SmallSources, AnswerFromTheFilesAsTheyAreNow) {
  ScratchRoot root;
  EXPECT_EQ(copy_preference("Key", "com.example"), PropertyValue());
  root.write_plist(kPreferences, dictionary({{"Key", 7}, {"Flag", true}}));
  EXPECT_EQ(copy_preference("Key", "com.example"), PropertyValue::integer(7));
  EXPECT_TRUE(has_integer_preference("Key", "com.example"));
  EXPECT_FALSE(has_integer_preference("Flag", "com.example"));
  for (const std::string& domain : {std::string("../Preferences/com.example"), std::string("com.example\0", 12),
                                    std::string(), std::string(5000, 'd')})
    EXPECT_EQ(copy_preference("Key", domain), PropertyValue()) << domain;
  root.write_plist(kAnswers, dictionary({{"ProductType", "One"}}));
  EXPECT_EQ(copy_device_answer("ProductType"), text("One"));
  root.write_plist(kAnswers, dictionary({{"ProductType", "Two"}}));
  EXPECT_EQ(copy_device_answer("ProductType"), text("Two"));
  EXPECT_EQ(copy_device_answer("Other"), PropertyValue());
}

TEST(HardwareRegistry, PropertiesAreFilesOfTheEntry) {
  ScratchRoot root;
  const std::string entry_path = "/sys/firmware/devicetree/base/baseband/";
  root.write_file(entry_path + "class", std::string_view("\x02\0\0\0", 4));
  root.write_file(entry_path + "large", std::string((64u << 10) + 1, 'x'));
  root.write_file(entry_path + "child/name", "x");
  root.make_fifo(entry_path + "fifo");
  root.make_link("class", entry_path + "link");
  const RegistryEntry entry = RegistryEntry::open("IODeviceTree:/baseband");
  ASSERT_TRUE(entry);
  EXPECT_EQ(entry.copy_property("class"), data(std::string_view("\x02\0\0\0", 4)));
  EXPECT_EQ(entry.copy_property("large").bytes().size(), 64u << 10);
  for (const std::string_view name : {"missing", "child", "child/name", "..", "", "fifo", "link"})
    EXPECT_EQ(entry.copy_property(name), PropertyValue()) << name;
  EXPECT_FALSE(RegistryEntry::open("IODeviceTree:/missing"));
  EXPECT_FALSE(RegistryEntry::open("IODeviceTree:/baseband/class"));
  EXPECT_FALSE(RegistryEntry::open("/baseband"));
}

}  // namespace
}  // namespace quorvel::test
