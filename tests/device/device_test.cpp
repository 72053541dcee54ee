// The telephony facts collector on the real run loop, against the simulator; and what kind of device it runs on.
#include <exception>

#include "device/device_type.h"
#include "device/telephony_facts.h"
#include "platform/process.h"
#include "quorvel/client.h"
#include "quorvel/observer.h"
#include "store/standard_key_classes.h"
#include "support/program.h"
#include "support/scratch_root.h"
#include "wire/telephony_state.h"

namespace quorvel::test {

const std::string kPosted = "com.Orvane.mobile.halvard.phone_number_changed";
const std::string kListening = "registerForTelvaneCallNotifications: now listening for Telvane notifications";

std::string old_line(const std::string& line) { return "lookup_baseband_info_old: " + line; }
std::string new_line(const std::string& line) { return "lookup_baseband_info_new: " + line; }
std::string copy_line(const std::string& line) { return "copyPostponementStuff: " + line; }
std::string dirtied(const std::string& key) { return "data_ark_set: dirtied by changing -" + key; }

class Simulator {
 public:
  Simulator() {
    client::Options options;
    options.service = "telvane";
    client_ = client::Client(options);
    if (!program_.wait_until_ready()) throw std::runtime_error("no simulator");
  }
  void set(std::string_view field, const Value& value) {
    tell(wire::kSetCommand, dictionary({{"Field", field}, {"Value", value}}));
  }
  void set_all(std::initializer_list<std::pair<std::string_view, Value>> fields) {
    for (const auto& [field, value] : fields) set(field, value);
  }
  void clear(std::string_view field) { tell(wire::kSetCommand, dictionary({{"Field", field}})); }
  void fail(std::string_view field, std::int32_t domain, std::int32_t code) {
    tell(wire::kFailCommand, dictionary({{"Field", field}, {"Domain", domain}, {"Code", code}}));
  }
  void succeed(std::string_view field) { tell(wire::kSucceedCommand, dictionary({{"Field", field}})); }
  void notify(std::string_view name) { tell(wire::kNotifyCommand, dictionary({{"Name", name}})); }

 private:
  void tell(std::string_view command, const PropertyValue& argument) {
    const client::Reply reply = client_.call(command, argument);
    if (reply.error) throw std::runtime_error(reply.error->description);
  }

  Program program_{simulator_program()};
  client::Client client_;
};

class TelephonyFacts : public testing::Test {
 protected:
  // Starts what the daemon starts before it collects, then serves deliveries while `scenario` runs on a thread.
  void serve(const std::function<void()>& scenario) {
    ASSERT_EQ(platform::start_process(), 0);
    platform::TelephonyCenter* center = platform::default_telephony_center();
    ASSERT_NE(center, nullptr);
    platform::bind_to_run_loop(center, platform::current_run_loop(), platform::RunLoopMode::default_mode);
    root.make_directory(kStateDirectory);
    root.write_plist(kDataFile, dictionary({{"-Kept", "value"}}));
    ark = data_ark_load();
    apply_standard_key_classes(ark);
    registerForTelvaneCallNotifications(ark);
    const std::vector<std::string> lines = root.log_lines();
    ASSERT_FALSE(lines.empty());
    EXPECT_EQ(lines.back(), kListening);
    std::thread thread([&] {
      try {
        ASSERT_FALSE(observer.connect());
        scenario();
        client::Event event;
        EXPECT_TRUE(observer.next(event, std::chrono::milliseconds(50))) << "one post too many";
      } catch (const std::exception& error) {
        ADD_FAILURE() << error.what();
      }
      ::kill(::getpid(), SIGTERM);
    });
    platform::run_main_run_loop();
    thread.join();
  }

  // One delivery, which must post so often and log exactly these lines.
  void deliver(std::string_view name, int posts, const std::vector<std::string>& lines) {
    SCOPED_TRACE(lines.empty() ? std::string(name) : lines.front());
    ++deliveries;
    simulator.set("gid2", deliveries);
    simulator.notify(name);
    for (int i = 0; i < posts; ++i) {
      client::Event event;
      ASSERT_FALSE(observer.next(event, kPatience));
      EXPECT_EQ(event.name, kPosted);
      EXPECT_EQ(event.object, text(kPosted));
    }
    // A run that logs nothing shows by what it stores.
    EXPECT_TRUE(lines.empty() ? eventually([&] { return stored("SIMGID2") == PropertyValue::integer(deliveries); })
                              : root.wait_for_log(lines.back()));
    EXPECT_EQ(root.log_lines(), lines);
  }

  [[nodiscard]] PropertyValue stored(std::string_view key) const { return data_ark_copy(ark, {}, text(key)); }

  ScratchRoot root;
  Simulator simulator;
  client::Observer observer;
  DataArk* ark = nullptr;
  int deliveries = 0;
};

TEST_F(TelephonyFacts, OldBaseband) {
  serve([&] {
    simulator.set_all({{"sim-status", "Ready"}, {"iccid", "8944"}, {"imsi", "2341"}});
    simulator.set_all({{"firmware-version", "1.0"}, {"bootloader-version", "b1"}, {"gid1", data("\1\2")}});
    deliver("sim-newly-inserted", 2,
            {old_line("We now have SIM status"), dirtied("PreviousSIMStatus"),
             old_line("Inserting ICCID into the data ark"), old_line("Inserting IMSI into the data ark"),
             old_line("Inserting baseband version into the data ark"), dirtied("BasebandVersion"),
             old_line("Inserting baseband bootloader version into the data ark")});
    EXPECT_EQ(stored("SIMGID1"), data("\1\2"));
    deliver("phone-number-changed", 1, {});

    // Versions that are stored stay, group identifiers of any kind are taken.
    simulator.set_all({{"sim-status", "Locked"}, {"iccid", "8945"}, {"imsi", "2342"}});
    simulator.set_all({{"firmware-version", "2.0"}, {"bootloader-version", "b2"}, {"gid1", array({1})}});
    deliver("sim-status-changed", 1,
            {old_line("The SIM status has changed"), dirtied("PreviousSIMStatus"), old_line("The ICCID has changed"),
             old_line("The IMSI has changed")});
    EXPECT_EQ(stored("BasebandBootloaderVersion"), text("b1"));
    EXPECT_EQ(stored("SIMGID1"), array({1}));

    // A failed query stops no other; without a value nothing changes, with one it counts.
    simulator.clear("iccid");
    simulator.set("imsi", "2343");
    const std::string fields[] = {"iccid", "imsi", "firmware-version", "bootloader-version", "gid1", "gid2"};
    const std::string queries[] = {
        "SIMIdentity", "MobileSubscriberIdentity", "FirmwareVersion", "BootloaderVersion", "Gid1", "Gid2"};
    std::vector<std::string> errors;
    for (std::size_t i = 0; i < std::size(fields); ++i) {
      simulator.fail(fields[i], INT32_MIN, INT32_MAX);
      errors.push_back(old_line("_TelvaneServerConnectionCopy" + queries[i] + "() error: -2147483648.2147483647"));
    }
    errors.push_back(old_line("The IMSI has changed"));
    deliver("sim-status-changed", 1, errors);
    EXPECT_EQ(stored("IntegratedCircuitCardIdentity"), text("8945"));
    for (const std::string& field : fields) simulator.succeed(field);

    // Values of another kind are no identity; empty ones take the stored identity away, once.
    simulator.set_all({{"iccid", 8946}, {"imsi", array({"2344"})}});
    deliver("sim-status-changed", 1, {});
    simulator.clear("sim-status");
    simulator.set_all({{"iccid", ""}, {"imsi", ""}});
    deliver("sim-status-changed", 1,
            {old_line("SIM status has gone away?"), "data_ark_remove_extended: dirtied by removing -PreviousSIMStatus",
             old_line("The ICCID has been removed"), old_line("The IMSI has been removed")});
    deliver("sim-status-changed", 1, {});

    // The removal took the key's class marks with it.
    simulator.set("iccid", "8947");
    deliver("sim-status-changed", 1,
            {old_line("Inserting ICCID into the data ark"), dirtied("IntegratedCircuitCardIdentity")});
    simulator.fail("connection", 1, 1);
    simulator.set("iccid", "8948");
    deliver("sim-newly-inserted", 2, {old_line("Could not connect to Telvane")});
  });
  data_ark_store(ark);
  EXPECT_EQ(root.read_plist(kDataFile),
            dictionary({{"-Kept", "value"}, {"-BasebandVersion", "1.0"}, {"-IntegratedCircuitCardIdentity", "8947"}}));
  root.expect_log({"data_ark_store: saved"});
}

TEST_F(TelephonyFacts, NewBaseband) {
  root.write_file("/sys/firmware/devicetree/base/baseband/class", std::string("\2\0\0\0", 4));
  const std::string silent = new_line("radio not responding");
  const auto status_changed = [&](const std::vector<std::string>& lines) {
    deliver("postponement-status-changed", 1, lines);
  };
  const auto radio_info = [&](const PropertyValue& info, const std::vector<std::string>& lines) {
    simulator.set("postponement", info);
    status_changed(lines);
  };
  serve([&] {
    status_changed({copy_line("Telvane returned NULL postponement"), silent});
    radio_info(array({"Ready"}), {copy_line("Telvane returned NULL postponement"), silent});
    radio_info(dictionary({{"Carrier", "None"}}), {copy_line("No status in postponement info"), silent});
    radio_info(dictionary({{"Status", "Error"}}), {copy_line("Telvane reports error: (null)"), silent});
    radio_info(dictionary({{"Status", "Error"}, {"ErrorReason", "no antenna"}}),
               {copy_line("Telvane reports error: no antenna"), silent});
    radio_info(dictionary({{"Status", "NotReady"}, {"Carrier", "None"}}), {new_line("radio not ready: NotReady")});
    radio_info(dictionary({{"Status", "Ready"}}),
               {new_line("throwing some postponement into ark, radio status: Ready")});
    simulator.fail("postponement", 1, -5);
    status_changed({copy_line("_TelvaneServerConnectionCopyPostponementStatus() error: 1.-5"), silent});
    simulator.fail("connection", 1, 1);
    status_changed({copy_line("Can't connect to Telvane"), silent});
    simulator.succeed("connection");
    simulator.succeed("postponement");
    EXPECT_EQ(data_ark_exists(ark, {}, text("Carrier")), 0);

    const std::string got = "__lookup_baseband_info_new_block_invoke: got ";
    const PropertyValue bands = array({1, "n78"});
    const std::vector<std::string> stored_lines = {new_line("throwing some postponement into ark, radio status: 7"),
                                                   got + "Bands = " + described(bands) + " from telvane",
                                                   got + "Carrier = Sample from telvane"};
    PropertyValue info = dictionary({{"Status", 7}, {"ErrorReason", "none"}, {"Carrier", "Sample"}, {"Bands", bands}});
    for (const char* identity :
         {"IntegratedCircuitCardIdentity", "MobileEquipmentIdentifier", "InternationalMobileEquipmentIdentity"}) {
      ASSERT_TRUE(info.set(identity, text("35")));
    }
    radio_info(info, stored_lines);
    // Only the one notification is observed.
    simulator.notify("sim-newly-inserted");
    status_changed(stored_lines);
  });
  EXPECT_EQ(data_ark_copy(ark, {}, {}),
            dictionary({{"Kept", "value"}, {"Carrier", "Sample"}, {"Bands", array({1, "n78"})}}));
  data_ark_store(ark);
  EXPECT_EQ(root.read_plist(kDataFile), dictionary({{"-Kept", "value"}}));
  root.expect_log({"data_ark_store: saved"});
}

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

const PropertyValue kUnnamed = dictionary({{"HasBaseband", true}});
const PropertyValue kOdd = dictionary({{"ProductType", 9}, {"HasBaseband", 1}});
const PropertyValue kBoard = dictionary({{"ProductType", "iXZfpgaY"}, {"HasBaseband", true}});
const std::string kOne("\1\0\0\0", 4), kFpga = detection("This is an FPGA, faking out product type as q35");
const std::string kWide =
    "getDeviceTreeInt: value for class property of IODeviceTree:/baseband is invalid (<02000000 02000000 8 bytes>)";

const std::string kHuge =
    "getDeviceTreeInt: value for class property of IODeviceTree:/baseband is invalid (<02020202 02020202 02020202 "
    "02020202 … 65536 bytes>)";

const Device kDevices[] = {
    {"Phone", {}, kPhone, kTwo, true, found("Ondrel9,2", true, 2)},
    {"OldBaseband", {}, kPhone, kOne, false, found("Ondrel9,2", true, 1)},
    {"NegativeClass", {}, kPhone, "\xfe\xff\xff\xff", false, found("Ondrel9,2", true, -2)},
    {"NothingKnown", {}, {}, "", false, after(kNoClass, found("(null)", false, -1))},
    {"NoProductType", {}, kUnnamed, kTwo, true, found("(null)", true, 2)},
    {"AnswersOfOtherKinds", {}, kOdd, kTwo, true, found("(null)", false, 2)},
    {"WideClass", {}, kPhone, kTwo + kTwo, false, after(kWide, found("Ondrel9,2", true, -1))},
    {"HugeClass", {}, kPhone, std::string(70'000, '\2'), false, after(kHuge, found("Ondrel9,2", true, -1))},
    {"Board", {}, kBoard, kTwo, false, overridden({kFpga})},
    {"HackMachine", text("Q35"), kPhone, kTwo, false, overridden({})},
    {"HackProduct", text("oNDREL5,1"), kPhone, kTwo, false, overridden({})},
    {"HackOtherText", text("q3%s5"), kPhone, kTwo, false, unsupported("q3%s5")},
    {"HackEmptyText", text(""), kPhone, kTwo, false, unsupported("")},
    {"HackFalse", PropertyValue::boolean(false), kPhone, kTwo, false, unsupported("false")},
    {"HackNumber", PropertyValue::integer(35), kPhone, kTwo, false, unsupported("35")}};
INSTANTIATE_TEST_SUITE_P(Devices, DeviceType, testing::ValuesIn(kDevices),
                         [](const auto& instance) { return instance.param.name; });

}  // namespace quorvel::test
