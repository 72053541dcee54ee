#include "log/extended_logging.h"

#include <gtest/gtest.h>

#include "log/daemon_log.h"
#include "support/scratch_root.h"
#include "support/values.h"

namespace quorvel::test {
namespace {

TEST(ExtendedLogging, IsSettledByReleaseTypeThenPreference) {
  const struct {
    const char* name;
    PropertyValue release_type;
    PropertyValue preference;
    int expected;
  } cases[] = {
      {"neither", nullptr, nullptr, 0},
      {"internal", text("Internal"), nullptr, 1},
      {"internal in another case", text("internal"), nullptr, 0},
      {"no text", data("Internal"), nullptr, 0},
      {"preference", text("Release"), PropertyValue::integer(1), 1},
      {"a preference of 0 counts as well", nullptr, PropertyValue::integer(0), 1},
      {"a text is no integer", nullptr, text("1"), 0},
      {"a boolean is no integer", nullptr, PropertyValue::boolean(true), 0},
      {"a real is no integer", nullptr, PropertyValue::real(1), 0},
  };
  EXPECT_EQ(extended_logging, 1) << "until it is settled";
  ScratchRoot root;
  for (const auto& [name, release_type, preference, expected] : cases) {
    PropertyValue answers = dictionary({}), preferences = dictionary({{"Other", 1}});
    ASSERT_TRUE(!release_type || answers.set("ReleaseType", release_type));
    ASSERT_TRUE(!preference || preferences.set("ExtLogging", preference));
    root.write_plist("/etc/quorvel/device_information.plist", answers);
    root.write_plist("/private/var/mobile/Library/Preferences/com.Orvane.quorveld.plist", preferences);
    setup_extended_logging();
    EXPECT_EQ(extended_logging, expected) << name;
  }
}

}  // namespace
}  // namespace quorvel::test
