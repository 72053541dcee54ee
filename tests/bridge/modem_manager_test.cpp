// The bridge on the real ModemManager, which talks to a fake modem. Sequences are asserted, never times.
#include <systemd/sd-bus.h>

#include "bridge/fake_modem.h"
#include "bridge/life.h"

namespace quorvel::test {
namespace {

constexpr const char* kDaemon = "/usr/bin/dbus-daemon";
constexpr const char* kManager = "/usr/sbin/ModemManager";
constexpr const char* kName = "org.freedesktop.ModemManager1";
constexpr const char* kCardOfFirst = "989453230000000010F1";
constexpr const char* kCardOfSecond = "989453230000000020F2";

class ModemManager : public testing::Test {
 protected:
  void SetUp() override {
    if (::access(kDaemon, X_OK) != 0 || ::access(kManager, X_OK) != 0) {
      GTEST_SKIP() << "needs the packages dbus-daemon and modemmanager";
    }
    address = "unix:path=" + (older.root.outside() / "bus").string();
    ::setenv("DBUS_SYSTEM_BUS_ADDRESS", address.c_str(), 1);
    ::setenv("DBUS_SESSION_BUS_ADDRESS", address.c_str(), 1);
    modem.insert(kCardOfFirst, "262021234567890");
  }

  void TearDown() override {
    if (HasFailure() && older.service) std::fputs(older.service->err().c_str(), stderr);
  }

  void start_bus() {
    std::filesystem::remove(older.root.outside() / "bus");
    bus.emplace(
        kDaemon,
        ProgramOptions{.arguments = {"--session", "--nofork", "--print-address", "--address=" + address}, .input = {}});
    ASSERT_TRUE(bus->wait_for_output("unix:"));
  }

  void start_manager() {
    manager.emplace(kManager,
                    ProgramOptions{.arguments = {"--test-session", "--test-enable", "--no-auto-scan", "--test-no-udev",
                                                 "--test-no-qrtr", "--test-no-suspend-resume"},
                                   .input = {}});
    ASSERT_TRUE(eventually([&] { return plug(modem.port()); }));
  }

  static void end(std::optional<Program>& program) {
    program->send_signal(SIGKILL);
    program->wait();
  }

  // Calls a method of ModemManager; false when it fails.
  template <typename... Arguments>
  static bool call(const std::string& path, const std::string& interface, const char* method, const char* types,
                   Arguments... arguments) {
    sd_bus* connection = nullptr;
    int result = sd_bus_open_system(&connection);
    if (result >= 0) {
      result = sd_bus_call_method(connection, kName, path.c_str(), interface.c_str(), method, nullptr, nullptr, types,
                                  arguments...);
    }
    sd_bus_flush_close_unref(connection);
    return result >= 0;
  }

  // Plugs the modem in, or again: ModemManager makes it anew.
  static bool plug(const std::string& port, const char* device = "first") {
    return call("/org/freedesktop/ModemManager1", std::string(kName) + ".Test", "SetProfile", "ssas", device, "quectel",
                1, port.c_str());
  }

  static bool send_pin(const char* pin) {
    bool done = false;
    for (int card = 0; card < 12 && !done; ++card) {
      done = call("/org/freedesktop/ModemManager1/SIM/" + std::to_string(card), std::string(kName) + ".Sim", "SendPin",
                  "s", pin);
    }
    return done;
  }

  void plug_again() { EXPECT_TRUE(plug(modem.port())); }
  void plug_second() { EXPECT_TRUE(plug(second.port(), "second")); }
  static void unplug(const char* device) { EXPECT_TRUE(plug("abstract:nobody", device)); }
  // Reports the card that is in the tray to ModemManager.
  void swap(const char* iccid, const std::string& imsi) {
    modem.insert(iccid, imsi);
    modem.report_swap();
  }
  void lock() {
    modem.answer("AT+CPIN?", "+CPIN: SIM PIN");
    modem.answer("AT+CIMI", "+CME ERROR: 11");
  }

  // How the bridge came to what it serves last.
  [[nodiscard]] static bool has_told(const Device& device, const std::string& line) {
    return eventually([&] { return device.service->err().find(line) != std::string::npos; }, 40s);
  }

  Device newer{Device::Baseband::newer};
  Device older{Device::Baseband::older};
  std::string address;
  FakeModem modem{"quorvel-" + std::to_string(::getpid())};
  FakeModem second{"quorvel-second-" + std::to_string(::getpid())};
  std::optional<Program> bus, manager;
};

// Each step is what happens to the modem and how many events tell of it; tests/bridge/life says what comes of them.
TEST_F(ModemManager, DaemonsFollowALifeOfAModem) {
  struct Turn {
    const char* name;
    std::size_t events;
    std::function<void()> begin;
  };
  const Turn turns[] = {
      {"a modem with a card", 2, [&] { start_manager(); }},
      {"another card", 3, [&] { swap(kCardOfSecond, "262029999999999"); }},
      {"no card", 2, [&] { modem.eject(), modem.report_swap(); }},
      {"a locked card", 3, [&] { modem.insert(kCardOfSecond, ""), lock(), modem.report_swap(); }},
      {"the wrong PIN", 0, [&] { EXPECT_FALSE(send_pin("4321")); }},
      {"the right PIN", 2, [&] { EXPECT_TRUE(send_pin("1234")); }},
      {"the same card, locked again", 2, [&] { lock(), plug_again(); }},
      {"another locked card", 3, [&] { modem.insert(kCardOfFirst, ""), lock(), plug_again(); }},
      {"a card without a lock", 2, [&] { modem.insert(kCardOfFirst, "262021234567890"), plug_again(); }},
      {"another number", 2,
       [&] {
         modem.answer("AT+CNUM", "+CNUM: \"\",\"+4915199999999\",145");
         plug_again();
       }},
      {"no number", 2, [&] { modem.answer("AT+CNUM", "ERROR"), plug_again(); }},
      {"a card that cannot be read", 2,
       [&] {
         modem.answer("AT+CRSM=176,12258,0,0,10", "+CME ERROR: 13");
         modem.answer("AT+CIMI", "+CME ERROR: 13");
         plug_again();
       }},
      {"a card that can", 2, [&] { modem.insert(kCardOfFirst, "262021234567890"), plug_again(); }},
      {"another firmware", 2, [&] { modem.answer("AT+CGMR", "FW 2.0"), plug_again(); }},
      {"a second modem", 0,
       [&] {
         second.insert(kCardOfSecond, "262028888888888");
         plug_second();
         EXPECT_TRUE(has_told(older, "also there: the modem /virtual/second (SIM status Ready)"));
       }},
      {"no card in the first", 3, [&] { modem.eject(), plug_again(); }},
      {"a card in the first", 0,
       [&] {
         modem.insert(kCardOfFirst, "262021234567890"), plug_again();
         EXPECT_TRUE(has_told(older, "also there: the modem /virtual/first (SIM status Ready)"));
       }},
      {"no card in the second", 3, [&] { second.eject(), plug_second(); }},
      {"unplugged", 2, [&] { unplug("second"), unplug("first"); }},
      {"plugged in", 2, [&] { plug_again(); }},
      {"ModemManager killed", 2, [&] { end(manager); }},
      {"ModemManager back", 2, [&] { start_manager(); }},
      {"the bus lost", 2, [&] { end(bus); }},
      {"the bus back", 2, [&] { start_bus(); }},
      {"ModemManager on the new bus", 2, [&] { start_manager(); }},
  };
  start_bus();
  for (Device* device : {&older, &newer}) {
    device->serve(bridge_program());
    device->start_daemon();
  }
  const std::string recorded = older.root.outside() / "recording";
  std::optional<Program> recorder;
  // A bridge that has not reached the bus yet tells so first.
  ASSERT_TRUE(eventually([&] {
    recorder.reset();
    std::filesystem::remove(recorded);
    recorder.emplace(control_program(), ProgramOptions{.arguments = {"sim", "record", recorded}, .input = {}});
    return eventually([&] { return std::filesystem::exists(recorded) && !steps_recorded(recorded).empty(); }) &&
           steps_recorded(recorded).front() == steps_recorded(kRecording).front();
  }));
  const std::vector<Step> steps = written_life();
  ASSERT_EQ(steps.size(), std::size(turns));
  std::size_t events = 1;
  for (std::size_t i = 0; i < std::size(turns); ++i) {
    turns[i].begin();
    events += turns[i].events;
    ASSERT_TRUE(eventually([&] { return steps_recorded(recorded).size() >= events; }, 40s)) << turns[i].name;
    const Step seen{turns[i].name, older.traces(steps[i].older), newer.traces(steps[i].newer)};
    EXPECT_EQ(text_of(seen), text_of(steps[i]));
  }
  recorder->stop();
  EXPECT_EQ(steps_recorded(recorded), steps_recorded(kRecording));

  // A daemon and a bridge that start again under the other one: the facts are there, and nothing has changed.
  older.daemon->stop();
  older.start_daemon();
  EXPECT_EQ(older.traces({steps.front().older.lines, 0}).lines, steps.front().older.lines);
  end(older.service);
  older.serve(bridge_program());
  EXPECT_TRUE(has_told(older, "for the first time: SIM status Ready"));
  EXPECT_EQ(older.traces({{}, 1}), Traces({{}, 1}));
  for (Device* device : {&older, &newer}) {
    EXPECT_EQ(device->daemon->stop().status, 0);
    device->root.ignore_log();
  }
}

}  // namespace
}  // namespace quorvel::test
