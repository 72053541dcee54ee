// The telephony facts collector on the real run loop, against the simulator.
#include "device/telephony_facts.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <csignal>
#include <exception>
#include <functional>
#include <string>
#include <thread>
#include <vector>

#include "platform/process.h"
#include "platform/wire/telephony_state.h"
#include "quorvel/client.h"
#include "quorvel/observer.h"
#include "store/standard_key_classes.h"
#include "support/program.h"
#include "support/scratch_root.h"
#include "support/values.h"

namespace quorvel::test {
namespace {

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
    simulator.set("sim-status", "Ready");
    simulator.set("iccid", "8944");
    simulator.set("imsi", "2341");
    simulator.set("firmware-version", "1.0");
    simulator.set("bootloader-version", "b1");
    simulator.set("gid1", data("\1\2"));
    deliver("sim-newly-inserted", 2,
            {old_line("We now have SIM status"), dirtied("PreviousSIMStatus"),
             old_line("Inserting ICCID into the data ark"), old_line("Inserting IMSI into the data ark"),
             old_line("Inserting baseband version into the data ark"), dirtied("BasebandVersion"),
             old_line("Inserting baseband bootloader version into the data ark")});
    EXPECT_EQ(stored("SIMGID1"), data("\1\2"));
    deliver("phone-number-changed", 1, {});

    // Versions that are stored stay, group identifiers of any kind are taken.
    simulator.set("sim-status", "Locked");
    simulator.set("iccid", "8945");
    simulator.set("imsi", "2342");
    simulator.set("firmware-version", "2.0");
    simulator.set("bootloader-version", "b2");
    simulator.set("gid1", array({1}));
    deliver("sim-status-changed", 1,
            {old_line("The SIM status has changed"), dirtied("PreviousSIMStatus"), old_line("The ICCID has changed"),
             old_line("The IMSI has changed")});
    EXPECT_EQ(stored("BasebandBootloaderVersion"), text("b1"));
    EXPECT_EQ(stored("SIMGID1"), array({1}));

    // A failed query stops no other; without a value nothing changes, with one it counts.
    simulator.clear("iccid");
    simulator.set("imsi", "2343");
    const std::vector<std::pair<std::string, std::string>> queries = {{"iccid", "SIMIdentity"},
                                                                      {"imsi", "MobileSubscriberIdentity"},
                                                                      {"firmware-version", "FirmwareVersion"},
                                                                      {"bootloader-version", "BootloaderVersion"},
                                                                      {"gid1", "Gid1"},
                                                                      {"gid2", "Gid2"}};
    std::vector<std::string> errors;
    for (const auto& [field, query] : queries) {
      simulator.fail(field, INT32_MIN, INT32_MAX);
      errors.push_back(old_line("_TelvaneServerConnectionCopy" + query + "() error: -2147483648.2147483647"));
    }
    errors.push_back(old_line("The IMSI has changed"));
    deliver("sim-status-changed", 1, errors);
    EXPECT_EQ(stored("IntegratedCircuitCardIdentity"), text("8945"));
    for (const auto& [field, query] : queries) simulator.succeed(field);

    // Values of another kind are no identity; empty ones take the stored identity away, once.
    simulator.set("iccid", 8946);
    simulator.set("imsi", array({"2344"}));
    deliver("sim-status-changed", 1, {});
    simulator.clear("sim-status");
    simulator.set("iccid", "");
    simulator.set("imsi", "");
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
    radio_info(dictionary({{"Status", 7},
                           {"ErrorReason", "none"},
                           {"Carrier", "Sample"},
                           {"IntegratedCircuitCardIdentity", "8944"},
                           {"MobileEquipmentIdentifier", "A1"},
                           {"InternationalMobileEquipmentIdentity", "35"},
                           {"Bands", bands}}),
               stored_lines);
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

TEST(TelephonyFactsAlone, NothingIsObservedWithoutAService) {
  ScratchRoot root;
  registerForTelvaneCallNotifications(nullptr);
  root.expect_log({"registerForTelvaneCallNotifications: Could not get the Telvane phone center"});
}

}  // namespace
}  // namespace quorvel::test
