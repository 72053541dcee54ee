// Preferences, device information and the hardware registry, from files of every kind.
#include <gtest/gtest.h>

#include <functional>
#include <string>

#include "platform/device_information.h"
#include "platform/hardware_registry.h"
#include "platform/preferences.h"
#include "support/descriptors.h"
#include "support/scratch_root.h"
#include "support/values.h"

namespace quorvel::test {
namespace {

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
                                    std::string(), std::string(5000, 'd')}) {
    EXPECT_EQ(copy_preference("Key", domain), PropertyValue()) << domain;
  }
  root.write_plist(kAnswers, dictionary({{"ProductType", "One"}}));
  EXPECT_EQ(copy_device_answer("ProductType"), text("One"));
  root.write_plist(kAnswers, dictionary({{"ProductType", "Two"}}));
  EXPECT_EQ(copy_device_answer("ProductType"), text("Two"));
  EXPECT_EQ(copy_device_answer("Other"), PropertyValue());
}

TEST(SmallSources, TakeNothingFromWhatIsNoDictionaryFile) {
  ScratchRoot root;
  EXPECT_EQ(copy_device_answer("ProductType"), PropertyValue());  // the root itself stays open from here on
  const std::size_t open_before = descriptors_open();
  const std::function<void()> things[] = {
      [&] { root.write_file(kAnswers, "rubbish"); },
      [&] { root.write_plist(kAnswers, array({"ProductType"})); },
      [&] { root.make_fifo(kAnswers); },
      [&] { root.make_directory(kAnswers); },
      [&] { root.make_link(kAnswers, kAnswers); },
  };
  for (const auto& thing : things) {
    root.remove(kAnswers);
    thing();
    EXPECT_EQ(copy_device_answer("ProductType"), PropertyValue());
  }
  EXPECT_EQ(descriptors_open(), open_before);
}

TEST(HardwareRegistry, PropertiesAreFilesOfTheEntry) {
  ScratchRoot root;
  const std::string entry_path = "/sys/firmware/devicetree/base/baseband/";
  root.write_file(entry_path + "class", std::string_view("\x02\0\0\0", 4));
  root.write_file(entry_path + "large", std::string((64u << 10) + 1, 'x'));
  root.write_file(entry_path + "child/name", "x");
  root.make_fifo(entry_path + "fifo");
  root.make_link("/etc", entry_path + "link");
  const RegistryEntry entry = RegistryEntry::open("IODeviceTree:/baseband");
  ASSERT_TRUE(entry);
  EXPECT_EQ(entry.copy_property("class"), data(std::string_view("\x02\0\0\0", 4)));
  for (const std::string_view name : {"missing", "large", "child", "child/name", "..", "", "fifo", "link"}) {
    EXPECT_EQ(entry.copy_property(name), PropertyValue()) << name;
  }
  EXPECT_FALSE(RegistryEntry::open("IODeviceTree:/missing"));
  EXPECT_FALSE(RegistryEntry::open("IODeviceTree:/baseband/class"));
  EXPECT_FALSE(RegistryEntry::open("/baseband"));
}

}  // namespace
}  // namespace quorvel::test
