// The bridge on the real ModemManager, which talks to a fake modem. Sequences are asserted, never times.
#include <systemd/sd-bus.h>

#include "bridge/fake_modem.h"
#include "support/program.h"
#include "support/scratch_root.h"
#include "support/socket_peer.h"

namespace quorvel::test {
namespace {

constexpr const char* kDaemon = "/usr/bin/dbus-daemon";
constexpr const char* kManager = "/usr/sbin/ModemManager";
constexpr const char* kName = "org.freedesktop.ModemManager1";

class ModemManager : public testing::Test {
 protected:
  void SetUp() override {
    root.make_directory("/run/quorvel");
    if (::access(kDaemon, X_OK) != 0 || ::access(kManager, X_OK) != 0) {
      GTEST_SKIP() << "needs the packages dbus-daemon and modemmanager";
    }
    modem.insert("989453230000000010F1", "262021234567890");
    address = "unix:path=" + (root.outside() / "bus").string();
    ::setenv("DBUS_SYSTEM_BUS_ADDRESS", address.c_str(), 1);
    ::setenv("DBUS_SESSION_BUS_ADDRESS", address.c_str(), 1);
    start_bus();
    bridge.emplace(bridge_program());
    ASSERT_TRUE(bridge->wait_until_ready());
    observer.emplace(SocketPeer::connected_to("telvane.sock"));
    ASSERT_EQ(observer->receive()->kind, wire::FrameKind::state);
  }

  void TearDown() override {
    if (HasFailure() && bridge) std::fputs(bridge->err().c_str(), stderr);
  }

  void start_bus() {
    std::filesystem::remove(root.outside() / "bus");
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
  static bool plug(const std::string& port, const char* id = "first") {
    return call("/org/freedesktop/ModemManager1", std::string(kName) + ".Test", "SetProfile", "ssas", id, "quectel", 1,
                port.c_str());
  }

  static bool send_pin(const char* pin) {
    bool done = false;
    for (int card = 0; card < 12 && !done; ++card) {
      done = call("/org/freedesktop/ModemManager1/SIM/" + std::to_string(card), std::string(kName) + ".Sim", "SendPin",
                  "s", pin);
    }
    return done;
  }

  // The next events must be `events`, by their initials, each with the state that is described as `state`.
  void expect(const std::string& step, const std::string& events, const std::string& state) {
    for (const char event : events) {
      const auto frame = observer->receive(40s);
      ASSERT_TRUE(frame) << step << ": no event came";
      const char initial = frame->name == "sim-newly-inserted"     ? 'I'
                           : frame->name == "sim-status-changed"   ? 'S'
                           : frame->name == "phone-number-changed" ? 'N'
                                                                   : 'P';
      ASSERT_EQ(std::string(1, initial), std::string(1, event)) << step << ": " << described(frame->value);
      std::string seen;
      for (const char* name : {"sim-status", "iccid", "imsi"}) {
        const PropertyValue& entry = frame->value.get(name);
        seen += (seen.empty() ? "" : " ") + (entry.get("Code") ? "1." + described(entry.get("Code"))
                                             : entry           ? described(entry.get("Value"))
                                                               : "-");
      }
      EXPECT_EQ(seen, state) << step << ": " << described(frame->value);
    }
  }

  ScratchRoot root;
  std::string address;
  FakeModem modem{"quorvel-" + std::to_string(::getpid())};
  std::optional<Program> bus, manager, bridge;
  std::optional<SocketPeer> observer;
};

const std::string kFirst = "Ready 8949353200000000011 262021234567890";
const std::string kSecond = "Ready 8949353200000000022 262029999999999";

TEST_F(ModemManager, ACardComesIsSwappedIsLockedAndGoes) {
  start_manager();
  expect("ready", "SP", kFirst);
  modem.insert("989453230000000020F2", "262029999999999");
  modem.report_swap();
  expect("swap", "ISP", kSecond);
  modem.eject();
  modem.report_swap();
  expect("eject", "SP", "NotInserted  ");
  modem.insert("989453230000000020F2", "262029999999999");
  modem.answer("AT+CPIN?", "+CPIN: SIM PIN");
  modem.answer("AT+CIMI", "+CME ERROR: 11");
  modem.report_swap();
  expect("locked", "ISP", "PinRequired 8949353200000000022 ");
  EXPECT_FALSE(send_pin("4321"));
  EXPECT_TRUE(send_pin("1234"));
  expect("right PIN", "SP", kSecond);
}

TEST_F(ModemManager, AModemIsPluggedInAgainAndManagerAndBusAreLost) {
  start_manager();
  expect("ready", "SP", kFirst);
  modem.answer("AT+CNUM", "+CNUM: \"\",\"+4915199999999\",145");
  EXPECT_TRUE(plug(modem.port()));
  expect("another number", "NP", kFirst);
  modem.answer("AT+CRSM=176,12258,0,0,10", "+CME ERROR: 13");
  modem.answer("AT+CIMI", "+CME ERROR: 13");
  EXPECT_TRUE(plug(modem.port()));
  expect("unreadable", "SP", "Ready 1.3 1.3");
  manager->send_signal(SIGKILL);
  manager->wait();
  expect("ModemManager killed", "SP", "- 1.5 1.5");
  modem.insert("989453230000000010F1", "262021234567890");
  start_manager();
  expect("ModemManager back", "SP", kFirst);
  EXPECT_TRUE(plug("abstract:nobody"));
  expect("unplugged", "SP", "- 1.1 1.1");
  EXPECT_TRUE(plug(modem.port()));
  expect("plugged in", "SP", kFirst);
  bus->send_signal(SIGKILL);
  bus->wait();
  expect("bus lost", "SP", "- 1.6 1.6");
  start_bus();
  expect("bus back", "SP", "- 1.5 1.5");
  SocketPeer late = SocketPeer::connected_to("telvane.sock");
  for (const char* name : {"", "sim-status-changed", "postponement-status-changed"}) {
    EXPECT_EQ(late.receive()->name, name);
  }
}

TEST_F(ModemManager, TheCardDecidesBetweenTwoModems) {
  modem.eject();
  FakeModem other("quorvel-other-" + std::to_string(::getpid()));
  other.insert("989453230000000020F2", "262029999999999");
  start_manager();
  expect("no card", "SP", "NotInserted  ");
  EXPECT_TRUE(plug(other.port(), "second"));
  expect("a card in the second", "ISP", kSecond);
}

// The daemon starts after everything was told, and collects all the same.
TEST_F(ModemManager, ADaemonWithTheOldBasebandCollectsTheFacts) {
  root.ignore_log();
  start_manager();
  expect("ready", "SP", kFirst);
  Program daemon(daemon_program());
  ASSERT_TRUE(daemon.wait_until_ready());
  const std::string head = "lookup_baseband_info_old: ";
  for (const char* line : {"We now have SIM status", "Inserting ICCID into the data ark",
                           "Inserting IMSI into the data ark", "Inserting baseband version into the data ark"}) {
    EXPECT_TRUE(root.wait_for_log(head + line)) << line;
  }
  modem.insert("989453230000000020F2", "262029999999999");
  modem.report_swap();
  EXPECT_TRUE(root.wait_for_log(head + "The ICCID has changed") && root.wait_for_log(head + "The IMSI has changed"));
  modem.eject();
  modem.report_swap();
  EXPECT_TRUE(root.wait_for_log(head + "The ICCID has been removed"));
  EXPECT_TRUE(root.wait_for_log(head + "The IMSI has been removed"));
  EXPECT_EQ(daemon.stop().status, 0);
}

TEST_F(ModemManager, ADaemonWithTheNewBasebandCollectsTheRadioInfo) {
  root.ignore_log();
  root.write_file("/sys/firmware/devicetree/base/baseband/class", std::string_view("\2\0\0\0", 4));
  start_manager();
  Program daemon(daemon_program());
  ASSERT_TRUE(daemon.wait_until_ready());
  expect("ready", "SP", kFirst);
  EXPECT_TRUE(root.wait_for_log("lookup_baseband_info_new: throwing some postponement into ark, radio status: Ready"));
  EXPECT_TRUE(
      root.wait_for_log("__lookup_baseband_info_new_block_invoke: got PhoneNumber = +4915112345678 from telvane"));
  EXPECT_TRUE(plug("abstract:nobody"));
  EXPECT_TRUE(root.wait_for_log("lookup_baseband_info_new: radio not ready: NotReady"));
  EXPECT_EQ(daemon.stop().status, 0);
}

// Commands that change something are refused: the modem decides.
TEST_F(ModemManager, IsShownButNotCommanded) {
  for (const char* command : {"set", "fail", "notify"}) {
    SocketPeer commander = SocketPeer::connected_to("telvane.sock");
    commander.send(frame_bytes(wire::FrameKind::call, 1, command, dictionary({{"Field", "iccid"}})));
    EXPECT_EQ(commander.receive()->kind, wire::FrameKind::state);
    EXPECT_EQ(commander.receive()->value.get("Description").text(), "this telephony service follows a modem");
  }
  SocketPeer viewer = SocketPeer::connected_to("telvane.sock");
  viewer.send(frame_bytes(wire::FrameKind::call, 1, "show"));
  EXPECT_EQ(viewer.receive()->kind, wire::FrameKind::state);
  EXPECT_EQ(viewer.receive()->kind, wire::FrameKind::reply);
}

}  // namespace
}  // namespace quorvel::test
