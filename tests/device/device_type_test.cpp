#include "device/device_type.h"

#include <gtest/gtest.h>

#include <atomic>
#include <string>
#include <thread>
#include <vector>

#include "support/scratch_root.h"
#include "support/values.h"

namespace quorvel::test {
namespace {

constexpr const char* kPreferences = "/private/var/mobile/Library/Preferences/com.Orvane.quorveld.plist";
constexpr const char* kAnswers = "/etc/quorvel/device_information.plist";
constexpr const char* kClassProperty = "/sys/firmware/devicetree/base/baseband/class";

const PropertyValue kPhone = dictionary({{"ProductType", "Ondrel9,2"}, {"HasBaseband", true}});
const std::string kTwo("\2\0\0\0", 4);

const std::string kNoClass = "getDeviceTreeInt: no class property of IODeviceTree:/baseband";

std::string detection(const std::string& line) { return "__get_device_type_internal_block_invoke: " + line; }

// The four lines of an override, and the three of every detection.
std::vector<std::string> found(const std::string& type, bool telephony, int baseband_class) {
  return {detection("product_type: " + type),
          "malformed: ", detection(std::string("has_telephony: ") + (telephony ? "true" : "false")),
          detection("baseband_class: " + std::to_string(baseband_class))};
}

std::vector<std::string> overridden(std::vector<std::string> lines) {
  lines.push_back(detection("Overriding machine type with q35 (Ondrel5,1)"));
  for (const std::string& line : found("Ondrel5,1", false, -1)) lines.push_back(line);
  return lines;
}

std::vector<std::string> unsupported(const std::string& value) {
  return overridden({detection("MachineHack value of '" + value + "' is not supported; assuming q35")});
}

std::vector<std::string> after(const std::string& line, std::vector<std::string> rest) {
  rest.insert(rest.begin(), line);
  return rest;
}

struct Device {
  std::string name;
  PropertyValue hack;          // the preference, none when it is not set
  PropertyValue answers;       // of the device-information service
  std::string class_property;  // its bytes, empty when the registry has none
  bool new_baseband;
  std::vector<std::string> log;
};

void PrintTo(const Device& device, std::ostream* out) { *out << device.name; }

class DeviceType : public testing::TestWithParam<Device> {};

TEST_P(DeviceType, IsDetectedOnce) {
  const Device& device = GetParam();
  ScratchRoot root;
  if (device.hack) root.write_plist(kPreferences, dictionary({{"MachineHack", device.hack}}));
  if (device.answers) root.write_plist(kAnswers, device.answers);
  if (!device.class_property.empty()) root.write_file(kClassProperty, device.class_property);

  std::atomic<int> new_basebands = 0;
  std::vector<std::thread> threads;
  for (int i = 0; i < 8; ++i) threads.emplace_back([&] { new_basebands += has_new_baseband(); });
  for (std::thread& thread : threads) thread.join();
  EXPECT_EQ(new_basebands, device.new_baseband ? 8 : 0);
  EXPECT_EQ(root.log_lines(), device.log);
}

INSTANTIATE_TEST_SUITE_P(
    Devices, DeviceType,
    testing::Values(Device{"Phone", {}, kPhone, kTwo, true, found("Ondrel9,2", true, 2)},
                    Device{"OldBaseband", {}, kPhone, std::string("\1\0\0\0", 4), false, found("Ondrel9,2", true, 1)},
                    Device{"NegativeClass", {}, kPhone, "\xfe\xff\xff\xff", false, found("Ondrel9,2", true, -2)},
                    Device{"NothingKnown", {}, {}, "", false, after(kNoClass, found("(null)", false, -1))},
                    Device{
                        "NoProductType", {}, dictionary({{"HasBaseband", true}}), kTwo, true, found("(null)", true, 2)},
                    Device{"AnswersOfOtherKinds",
                           {},
                           dictionary({{"ProductType", 9}, {"HasBaseband", 1}}),
                           kTwo,
                           true,
                           found("(null)", false, 2)},
                    Device{"WideClass",
                           {},
                           kPhone,
                           kTwo + kTwo,
                           false,
                           after("getDeviceTreeInt: value for class property of IODeviceTree:/baseband is invalid "
                                 "(<02000000 02000000 8 bytes>)",
                                 found("Ondrel9,2", true, -1))},
                    Device{"Board",
                           {},
                           dictionary({{"ProductType", "iXZfpgaY"}, {"HasBaseband", true}}),
                           kTwo,
                           false,
                           overridden({detection("This is an FPGA, faking out product type as q35")})},
                    Device{"HackMachine", text("Q35"), kPhone, kTwo, false, overridden({})},
                    Device{"HackProduct", text("oNDREL5,1"), kPhone, kTwo, false, overridden({})},
                    Device{"HackOtherText", text("q3%s5"), kPhone, kTwo, false, unsupported("q3%s5")},
                    Device{"HackEmptyText", text(""), kPhone, kTwo, false, unsupported("")},
                    Device{"HackFalse", PropertyValue::boolean(false), kPhone, kTwo, false, unsupported("false")},
                    Device{"HackNumber", PropertyValue::integer(35), kPhone, kTwo, false, unsupported("35")}),
    [](const auto& instance) { return instance.param.name; });

}  // namespace
}  // namespace quorvel::test
