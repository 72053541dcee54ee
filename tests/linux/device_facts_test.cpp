// The live answers, asked of machines that are described in a scratch root.
#include <sys/utsname.h>

#include <fstream>

#include "linux/device/source_table.h"
#include "linux/device/sources/machine_id.h"
#include "linux/device/sources/parsing.h"
#include "platform/device_information.h"
#include "platform/device_paths.h"
#include "platform/preferences.h"
#include "platform/telephony.h"
#include "support/scratch_root.h"

namespace quorvel::test {
namespace {

using namespace platform;
using namespace std::string_literals;

// A machine: one line for each file, "PATH = CONTENT" with \0, \n, \r and \e in it, or "PATH -> TARGET" for a link. A
// first line that ends in "/" is the directory that the next ones lie in.
void unfold(ScratchRoot& root, const std::string& description) {
  std::istringstream lines(description);
  std::string folder;
  for (std::string line; std::getline(lines, line);) {
    const std::size_t value = line.find(" = ");
    const std::size_t link = line.find(" -> ");
    if (value == std::string::npos && link == std::string::npos) {
      folder = line;
      root.make_directory(folder);
    } else if (value == std::string::npos) {
      root.make_link(line.substr(link + 4), folder + line.substr(0, link));
    } else {
      std::string content;
      for (std::size_t i = value + 3; i < line.size(); ++i) {
        const bool escaped = line[i] == '\\' && i + 1 < line.size();
        const char c = escaped ? line[++i] : line[i];
        content += !escaped ? c : c == '0' ? '\0' : c == 'n' ? '\n' : c == 'r' ? '\r' : c == 'e' ? '\x1b' : c;
      }
      root.write_file(folder + line.substr(0, value), content);
    }
  }
}

const std::string kTree = std::string(paths::kDeviceTree) + "/\n";
const std::string kDmi = std::string(paths::kFirmwareTable) + "/\n";
const std::string kNet = std::string(paths::kNetworkInterfaces) + "/\n";
const std::string kSupplies = std::string(paths::kPowerSupplies) + "/\n";
const std::string kRfkill = std::string(paths::kRadioSwitches) + "/\n";

const std::string kPhone =
    kTree +
    "compatible = pine64,pinephone-1.2\\0pine64,pinephone\\0allwinner,sun50i-a64\\0\n"
    "model = Pine64 PinePhone (1.2)\\0\nserial-number = 02c00081\\0\nchosen/u-boot,version = 2022.01\\0\n"
    "aliases/bluetooth0 = /soc/serial/bluetooth\\0\n"
    "soc/serial/bluetooth/local-bd-address = \x55\x44\x33\x22\x11\\0\n" +
    kSupplies +
    "axp20x-battery/type = Battery\naxp20x-battery/status = Charging\naxp20x-battery/capacity = 43\n"
    "axp20x-usb/type = USB\naxp20x-usb/online = 1\n" +
    kRfkill +
    "rfkill0/type = wlan\nrfkill0/soft = 1\nrfkill0/hard = 0\nrfkill1/type = bluetooth\nrfkill1/soft = 0\n"
    "rfkill1/hard = 1\nrfkill2/type = gps\nrfkill2/soft = 0\n" +
    kNet +
    "wlan0/phy80211/macaddress = 3c:6a:9d:00:11:22\nwlan0/phy80211/index = 0\nwlan0/addr_assign_type = 3\n"
    "wlan0/address = ba:00:00:00:00:01\nwlan0/device/x = \nwlan0/type = 1\nwlan0/ifindex = 2\n" +
    "/sys/class/wwan/wwan0/\ntype = \n";

const std::string kLaptop =
    kDmi +
    "sys_vendor = LENOVO\\n\nproduct_name = 20QQS0JD01\\n\nproduct_version = ThinkPad P53\\n\n"
    "board_name = Default string\\n\nproduct_sku = LENOVO_MT_20QQ\\n\nbios_version = N2NET34W (1.12 )\\n\n"
    "product_serial = PF1ABCDE\\n\nboard_serial = 00000000\\n\n" +
    "/etc/\nmachine-id = 0123456789abcdef0123456789abcdef\\n\nos-release -> /usr/lib/os-release\n"
    "/usr/lib/\nos-release = # comment\\nVERSION_ID=\"11\"\\nVERSION_ID='12'\\r\\nBUILD_ID=rolling\\n\n" +
    kSupplies +
    "BAT0/type = Battery\nBAT0/status = Unknown\nBAT0/energy_now = 10000000\nBAT0/energy_full = 20000000\n"
    "BAT1/type = Battery\nBAT1/status = Discharging\nBAT1/energy_now = 15000000\n"
    "BAT1/energy_full = 60000000\nAC/type = Mains\nAC/online = 0\n" +
    "/sys/devices/pci0/0000:00:1f.6/net/eth1/\naddress = 54:e1:ad:00:00:02\\n\naddr_assign_type = 0\ntype = 1\n"
    "ifindex = 3\ndevice -> ../../../0000:00:1f.6\n" +
    kNet +
    "eth1 -> ../../devices/pci0/0000:00:1f.6/net/eth1\n"
    "eth0/address = 54:e1:ad:00:00:01\neth0/addr_assign_type = 1\neth0/type = 1\neth0/ifindex = 2\n"
    "eth0/device/x = \nbr0/address = 54:e1:ad:00:00:09\nbr0/addr_assign_type = 0\nbr0/type = 1\nbr0/ifindex = 1\n";

const std::string kVirtualMachine = kTree + "compatible = linux,dummy-virt\\0\nmodel = linux,dummy-virt\\0\n" + kDmi +
                                    "product_name = To Be Filled By O.E.M.\\n\nboard_name = B450M\\n\n" + kNet +
                                    "eth0/address = 02:fc:00:00:00:01\neth0/addr_assign_type = 0\neth0/type = 1\n"
                                    "eth0/ifindex = 4\neth0/device/x = \n";

// The page on device facts: the cells behind each question of its table, and the questions of its list.
struct Page {
  std::map<std::string, std::vector<std::string>, std::less<>> table;
  std::set<std::string, std::less<>> list;

  Page() {
    std::ifstream file(QUORVEL_SOURCE_DIR "/docs/device-facts.md");
    for (std::string line; std::getline(file, line);) {
      if (line.starts_with("- `") && line.ends_with('`')) list.insert(line.substr(3, line.size() - 4));
      if (!line.starts_with("| `")) continue;
      std::vector<std::string> cells;
      std::istringstream columns(line.substr(2));
      for (std::string cell; std::getline(columns, cell, '|');) {
        const std::size_t start = std::min(cell.find_first_not_of(' '), cell.size());
        cells.push_back(cell.substr(start, cell.find_last_not_of(' ') + 1 - start));
      }
      const std::string question = cells.at(0).substr(1, cells.at(0).size() - 2);
      cells.erase(cells.begin());
      table.emplace(question, std::move(cells));
    }
  }

  // An origin is a path whose last component, or whose folder, the page names, or a source in words.
  [[nodiscard]] bool tells(std::string_view question, std::string_view origin) const {
    const auto row = table.find(question);
    if (row == table.end()) return false;
    const auto names = [&](std::string_view place) { return row->second.at(2).find(place) != std::string::npos; };
    const std::size_t slash = origin.rfind('/');
    if (slash == std::string_view::npos) return names(origin.substr(origin.rfind(' ') + 1));
    return names(origin.substr(slash + 1)) || names(origin.substr(0, slash));
  }
};

// What the machine answers, one "QUESTION = VALUE" each; nothing else may have an answer.
std::map<std::string, std::string> answers() {
  static const Page page;
  std::map<std::string, std::string> all;
  for (const DeviceQuestion& question : kDeviceQuestions) {
    const DeviceAnswer answer = copy_device_answer_with_origin(question.name);
    EXPECT_EQ(static_cast<bool>(answer.value), static_cast<bool>(answer.origin)) << question.name;
    if (!answer.value || question.name == "CPUArchitecture") continue;
    EXPECT_EQ(answer.value.kind(), question.kind) << question.name;
    EXPECT_TRUE(page.tells(question.name, answer.origin.text())) << question.name << ' ' << answer.origin.text();
    const PropertyValue& value = answer.value;
    all.emplace(question.name, value.is_string()                       ? std::string(value.text())
                               : value.kind() == PropertyKind::boolean ? (value.to_boolean() ? "true" : "false")
                                                                       : std::to_string(*value.to_int64()));
  }
  return all;
}

using Answers = std::map<std::string, std::string>;

TEST(DeviceFacts, StandInTheDocument) {
  const Page page;
  for (const DeviceQuestion& question : kDeviceQuestions) {
    const bool is_answered = std::ranges::any_of(
        host::kQuestionSources, [&question](const auto& row) { return row.question == question.name; });
    EXPECT_EQ(page.list.contains(question.name), !is_answered) << question.name;
    EXPECT_EQ(page.table.contains(question.name), is_answered) << question.name;
    if (!is_answered || !page.table.contains(question.name)) continue;
    const std::vector<std::string>& cells = page.table.find(question.name)->second;
    const std::map<PropertyKind, std::string> kinds = {
        {PropertyKind::boolean, "boolean"}, {PropertyKind::integer, "integer"}, {PropertyKind::string, "text"}};
    EXPECT_EQ(cells.at(0), kinds.at(question.kind)) << question.name;
    EXPECT_EQ(cells.at(1), question.unit) << question.name;
  }
  EXPECT_EQ(page.list.size() + page.table.size(), kDeviceQuestionCount);
}

TEST(DeviceFacts, APhoneIsDescribedByItsDeviceTree) {
  ScratchRoot root;
  unfold(root, kPhone);
  EXPECT_EQ(answers(), (Answers{{"AirplaneMode", "true"},
                                {"BatteryCurrentCapacity", "43"},
                                {"BatteryIsCharging", "true"},
                                {"BatteryIsFullyCharged", "false"},
                                {"BluetoothAddress", "00:11:22:33:44:55"},
                                {"ExternalChargeCapability", "true"},
                                {"ExternalPowerSourceConnected", "true"},
                                {"FirmwareVersion", "2022.01"},
                                {"HWModelStr", "pine64,pinephone-1.2"},
                                {"HardwarePlatform", "allwinner,sun50i-a64"},
                                {"HasBaseband", "true"},
                                {"ProductType", "pine64,pinephone-1.2"},
                                {"SerialNumber", "02c00081"},
                                {"WifiAddress", "3c:6a:9d:00:11:22"},
                                {"gas-gauge-battery", "false"},
                                {"marketing-name", "Pine64 PinePhone (1.2)"},
                                {"wifi", "true"}}));
}

TEST(DeviceFacts, ALaptopIsDescribedByItsFirmwareTable) {
  ScratchRoot root;
  unfold(root, kLaptop);
  Answers found = answers();
  const std::string identifier = found["UniqueDeviceID"];
  EXPECT_EQ(identifier.size(), 32u);
  EXPECT_EQ(identifier.find("01234567"), std::string::npos) << "the machine-id itself left the machine";
  found.erase("UniqueDeviceID");
  EXPECT_EQ(found, (Answers{{"BatteryCurrentCapacity", "31"},
                            {"BatteryIsCharging", "false"},
                            {"BatteryIsFullyCharged", "false"},
                            {"BuildVersion", "rolling"},
                            {"EthernetMacAddress", "54:e1:ad:00:00:02"},
                            {"ExternalChargeCapability", "false"},
                            {"ExternalPowerSourceConnected", "false"},
                            {"FirmwareVersion", "N2NET34W (1.12 )"},
                            {"HWModelStr", "20QQS0JD01"},
                            {"ModelNumber", "LENOVO_MT_20QQ"},
                            {"ProductType", "20QQS0JD01"},
                            {"ProductVersion", "12"},
                            {"SerialNumber", "PF1ABCDE"},
                            {"gas-gauge-battery", "true"},
                            {"marketing-name", "ThinkPad P53"},
                            {"wifi", "false"}}));
  EXPECT_EQ(copy_device_answer_with_origin("ProductType").origin, text("/sys/class/dmi/id/product_name"));
  root.write_plist(paths::kDeviceInformation, dictionary({{"ProductType", "Ours"}, {"BoardId", 7}}));
  EXPECT_EQ(copy_device_answer("ProductType"), text("Ours"));
  EXPECT_EQ(copy_device_answer_with_origin("BoardId").origin, text(paths::kDeviceInformation));
}

TEST(DeviceFacts, AnUnknownMachineIsNotInvented) {
  ScratchRoot root;
  EXPECT_EQ(answers(), Answers{});
  unfold(root, kVirtualMachine);
  EXPECT_EQ(answers(), (Answers{{"EthernetMacAddress", "02:fc:00:00:00:01"},
                                {"HWModelStr", "B450M"},
                                {"marketing-name", "B450M"},
                                {"wifi", "false"}}));
  struct utsname system;
  ASSERT_EQ(::uname(&system), 0);
  EXPECT_EQ(copy_device_answer("CPUArchitecture"), text(system.machine));
}

TEST(DeviceFacts, OddCases) {
  const std::string bat = "BAT0/type = Battery\nBAT0/status = Not charging\n";
  const struct {
    std::string files;
    const char* question;
    const char* expected;  // empty: none
  } cases[] = {
      {kDmi + "product_name = X\\e[31mred\n", "ProductType", ""},
      {kDmi + "product_name = \xff\xfe\n", "ProductType", ""},
      {kDmi + "product_name = ........\n", "ProductType", ""},
      {kDmi + "product_name =  My default \n", "ProductType", "My default"},
      {kDmi + "product_serial = ab\n", "SerialNumber", ""},
      {"/proc/\ncpuinfo = Hardware : X\\nSerial\t\t: 00000000abcd\\n\n", "SerialNumber", "00000000abcd"},
      {"/proc/\ncmdline = quiet androidboot.serialno=XY12 ro\\n\n", "SerialNumber", "XY12"},
      {"/sys/devices/soc0/\nsoc_id = jep106:036b:0000\n", "ChipID", ""},
      {"/sys/devices/soc0/\nsoc_id = 321\\n\n", "ChipID", "321"},
      {"/sys/devices/soc0/\nserial_number = 0x1234abcd\\n\n", "UniqueChipID", "305441741"},
      {"/sys/devices/soc0/\nserial_number = 0x10000000000000000\n", "UniqueChipID", ""},
      {"/etc/\nmachine-info = HARDWARE_MODEL=\"My \\\\\"Phone\\\\\"\"\\n\n", "marketing-name", "My \"Phone\""},
      {"/etc/\nos-release = VERSION_ID=1\\nVERSION_ID=\"2\" x\\nVERSION_ID='3\\n\n", "ProductVersion", "1"},
      {"/etc/\nos-release = VERSION_ID=a\\\\ b\\n\n/usr/lib/\nos-release = BUILD_ID=9\\n\n", "ProductVersion", "a b"},
      {"/etc/\nos-release = X=1\\n\n/usr/lib/\nos-release = BUILD_ID=9\\n\n", "BuildVersion", ""},
      {"/etc/\nmachine-id = uninitialized\\n\n", "UniqueDeviceID", ""},
      {kSupplies + bat + "BAT0/capacity = 80\nAC/type = Mains\nAC/online = 1\n", "BatteryIsFullyCharged", "false"},
      {kSupplies + bat + "BAT0/capacity = 100\n", "BatteryIsFullyCharged", "true"},
      {kSupplies + bat + "BAT0/charge_now = 1500000\nBAT0/charge_full = 3000000\n", "BatteryCurrentCapacity", "50"},
      {kSupplies + bat + "BAT0/capacity/x = \nBAT0/energy_now = 9000000000\nBAT0/energy_full = 9\n",
       "BatteryCurrentCapacity", "100"},
      {kSupplies + bat + "BAT0/capacity = 58\nBAT0/present = 0\n", "BatteryCurrentCapacity", ""},
      {kSupplies + bat + "BAT0/capacity = 58\nAAA/type = Battery\nAAA/scope = Device\nAAA/capacity = 15\n",
       "BatteryCurrentCapacity", "58"},
      {kSupplies + "AC/type = Mains\nAC/online = 0\nucsi/type = USB_PD\nucsi/online = 2\n",
       "ExternalPowerSourceConnected", "true"},
      {kRfkill + "rfkill0/type = wlan\nrfkill0/soft = 0\nrfkill1/type = bluetooth\nrfkill1/soft = 1\n", "AirplaneMode",
       "false"},
      {kRfkill + "rfkill0/type = nfc\nrfkill0/soft = 1\n", "AirplaneMode", ""},
      {kNet + "wlan0/phy80211/macaddress = 3c:6a:9d:00:11:22\nwlan0/addr_assign_type = 1\n"
              "wlan0/address = 3c:6a:9d:00:11:22\nwlan0/device/x = \n",
       "WifiAddress", ""},
      {kNet + "wwan0/uevent = A=1\\nDEVTYPE=wwan\\n\n", "HasBaseband", "true"},
      {kNet + "eth0/address = 01:00:5e:00:00:01\neth0/addr_assign_type = 0\neth0/type = 1\neth0/device/x = \n",
       "EthernetMacAddress", ""},
      {"/sys/bus/sdio/devices/\nmmc1:1/net/wlan0/x = \nmmc1:1/info1 = WLAN\nmmc1:1/info2 = rev1\n", "SDIOProductInfo",
       "WLAN rev1"},
  };
  ScratchRoot root;
  for (const auto& c : cases) {
    for (const char* folder : {"/sys", "/proc", "/etc", "/usr"}) root.remove(folder);
    unfold(root, c.files);
    const Answers found = answers();
    const auto at = found.find(c.question);
    EXPECT_EQ(at == found.end() ? "" : at->second, c.expected) << c.files;
  }
}

TEST(DeviceFacts, AHostileFileIsAMissingFact) {
  ScratchRoot root;
  root.make_directory("/sys/class/dmi/id");
  root.make_fifo("/sys/class/dmi/id/product_name");
  root.write_file("/sys/class/dmi/id/board_name", std::string(1u << 20, 'x') + "y");
  root.make_directory("/sys/class/dmi/id/product_sku");
  root.make_link("/sys/class/power_supply", "/sys/class/power_supply");
  EXPECT_EQ(answers(), Answers{});
}

TEST(DeviceFacts, AFileThatCannotBeUsedIsToldOfOnce) {
  ScratchRoot root;
  const auto said = [](const auto& ask) {
    testing::internal::CaptureStderr();
    for (int i = 0; i < 2; ++i) EXPECT_FALSE(ask());
    return testing::internal::GetCapturedStderr();
  };
  const auto answer = [] { return copy_device_answer("SerialNumber"); };
  const auto preference = [] { return platform::copy_preference("Key", "com.example"); };
  const std::string of_answers = "/etc/quorvel/device_information.plist", kept = encoded(dictionary({{"a", 1}}));
  const std::string of_domain = "/private/var/mobile/Library/Preferences/com.example.plist";
  const std::string unusable = " does not hold a dictionary as a binary property list\n";
  EXPECT_EQ(said(answer) + said(preference), "") << "absent";
  for (const std::string& content : {std::string("<?xml version=\"1.0\"?>"), encoded(array({1})), std::string()}) {
    for (const std::string& path : {of_answers, of_domain}) root.write_file(path, content);
    EXPECT_EQ(said(answer), "quorveld: " + of_answers + unusable);
    EXPECT_EQ(said(preference), "quorveld: " + of_domain + unusable);
    for (const std::string& path : {of_answers, of_domain}) root.write_file(path, kept);
    EXPECT_EQ(said(answer) + said(preference), "") << "usable";
  }
  root.remove(of_answers);
  root.make_link(of_answers, of_answers);
  EXPECT_EQ(said(answer), "quorveld: cannot open " + of_answers + ": Too many levels of symbolic links\n");
}

TEST(DeviceFacts, WhatNobodyMayReadIsNoFact) {
  ScratchRoot root;
  unfold(root, kDmi + "product_serial = PF1ABCDE\nproduct_name = Book\n");
  root.set_mode("/sys/class/dmi/id/product_serial", 0000);
  EXPECT_EQ(answers().count("SerialNumber"), ::geteuid() == 0 ? 1u : 0u) << "root may read it";
  ASSERT_EQ(::geteuid() == 0 ? ::seteuid(65534) : 0, 0);
  EXPECT_EQ(answers(), (Answers{{"ProductType", "Book"}, {"HWModelStr", "Book"}, {"marketing-name", "Book"}}));
  ASSERT_EQ(::seteuid(::getuid()), 0);
}

TEST(DeviceFacts, TheTelephonyServicesLastStateAnswers) {
  const ScratchRoot root;
  const auto value = [](const Value& given) { return dictionary({{"Value", given}}); };
  const PropertyValue radio =
      value(dictionary({{"Status", "NotReady"}, {"InternationalMobileEquipmentIdentity", " 490154203237518\n"}}));
  const struct {
    PropertyValue state;
    Answers expected;
  } cases[] = {
      {dictionary({{"imsi", value("262015099999999")}, {"firmware-version", value("1.2")}, {"postponement", radio}}),
       {{"BasebandFirmwareVersion", "1.2"},
        {"BasebandPostponementStatus", "NotReady"},
        {"InternationalMobileEquipmentIdentity", "490154203237518"},
        {"MobileSubscriberCountryCode", "262"}}},
      {dictionary({{"imsi", value("26201509999999x")},
                   {"firmware-version", value("1\x1b[2J")},
                   {"postponement", value("Ready")}}),
       {}},
      {dictionary({{"imsi", value("26201")},
                   {"firmware-version", value(7)},
                   {"postponement", value(dictionary({{"Status", true}}))}}),
       {}},
      {dictionary({{"imsi", dictionary({{"Value", "262015099999999"}, {"Domain", 1}, {"Code", 2}})}}), {}},
      {dictionary({{"firmware-version", value("1.2")}, {"connection", dictionary({{"Code", 1}})}}), {}},
      {nullptr, {}},
  };
  for (const auto& [state, expected] : cases) {
    keep_telephony_state(state);
    EXPECT_EQ(answers(), expected) << described(state);
  }
}

TEST(DeviceFacts, TheIdentifierIsTheOneThatOtherToolsDerive) {
  std::byte machine[16], application[16];
  ASSERT_TRUE(host::parse_machine_id("0123456789abcdef0123456789abcdef", machine));
  ASSERT_TRUE(host::parse_machine_id("5d1f2c3b4a5968778695a4b3c2d1e0ff", application));
  const auto text = host::derive_identifier(machine, application);
  EXPECT_EQ(std::string(text.begin(), text.end()), "e0918de3171a4b559087067af889aba4");
}

}  // namespace
}  // namespace quorvel::test
