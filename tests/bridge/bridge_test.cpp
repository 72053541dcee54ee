// The bridge as a program, on a bus that says what the test wants: its socket, and what a hostile bus does to it.
#include "bridge/fake_bus.h"
#include "support/program.h"
#include "support/scratch_root.h"
#include "support/socket_peer.h"

namespace quorvel::test {
namespace {

constexpr const char* kModem = "org.freedesktop.ModemManager1.Modem";
const std::string kModemPath = "/org/freedesktop/ModemManager1/Modem/0";
const std::string kCardPath = "/org/freedesktop/ModemManager1/SIM/0";

Properties modem() {
  return {{"State", variant("i", 3)},
          {"UnlockRequired", variant("u", 1)},
          {"Sim", variant("o", "/org/freedesktop/ModemManager1/SIM/0")},
          {"Device", variant("s", "/virtual/first")},
          {"OwnNumbers", variant("as", 1, "+1")},
          {"Revision", variant("s", "FW")}};
}
Properties card(const std::string& iccid) {
  // The message is made later, when the caller's text may have ended.
  const Append identifier = [iccid](sd_bus_message* message) {
    return sd_bus_message_append(message, "v", "s", iccid.c_str());
  };
  return {{"SimIdentifier", identifier}, {"Imsi", variant("s", "26202")}, {"Gid1", variant("ay", 1, 0xab)}};
}
Properties with(Properties properties, const std::string& name, Append value) {
  properties[name] = std::move(value);
  return properties;
}

std::string field(const PropertyValue& state, const char* name) {
  const PropertyValue& entry = state.get(name);
  if (!entry) return "-";
  if (!entry.get("Code")) return described(entry.get("Value"));
  return described(entry.get("Domain")) + "." + described(entry.get("Code"));
}

// The event and three facts, or the end.
std::string next(SocketPeer& observer, std::chrono::milliseconds patience = kPatience) {
  const auto frame = observer.receive(patience);
  if (!frame) return "(nothing)";
  const PropertyValue& state = frame->value;
  return (frame->kind == wire::FrameKind::state ? "state" : frame->name) + ": " + field(state, "sim-status") + " " +
         field(state, "iccid") + " " + field(state, "imsi");
}

class Bridge : public testing::Test {
 protected:
  Bridge() {
    root.ignore_log();
    root.make_directory("/run/quorvel");
    bus.answer("GetManagedObjects", modems_of({{kModemPath, modem()}}));
    bus.answer(kCardPath, dictionary_of(card("A1")));
  }

  void start(std::vector<std::string> arguments = {}) {
    program.emplace(bridge_program(), ProgramOptions{.arguments = std::move(arguments), .input = {}});
    ASSERT_TRUE(program->wait_until_ready());
  }

  static SocketPeer observer() { return SocketPeer::connected_to("telvane.sock"); }

  static PropertyValue shown() {
    SocketPeer viewer = observer();
    viewer.send(frame_bytes(wire::FrameKind::call, 1, "show"));
    for (auto frame = viewer.receive(); frame; frame = viewer.receive()) {
      if (frame->kind == wire::FrameKind::reply) return frame->value;
    }
    return nullptr;
  }

  void tell_modem_changed(const std::string& member = "StateChanged") {
    bus.send_signal(kModemPath, kModem, member, body("iiu", 1, 3, 0u));
  }

  // Has the bridge read the card `iccid`, and waits until that is what it serves.
  void expect_to_read(const std::string& iccid, const std::string& after) {
    bus.answer("GetManagedObjects", modems_of({{kModemPath, modem()}}));
    bus.answer(kCardPath, dictionary_of(card(iccid)));
    tell_modem_changed();
    EXPECT_TRUE(eventually([&] { return field(shown(), "iccid") == iccid; }, 20s)) << after << program->err();
    EXPECT_TRUE(program->running()) << after << program->err();
  }

  ScratchRoot root;
  FakeBus bus{(root.outside() / "bus").string()};
  std::optional<Program> program;
};

TEST_F(Bridge, TellsObserversEarlyAndLateAndNobodyWhoCommands) {
  bus.answer("GetManagedObjects", nullptr);
  start();
  SocketPeer early = observer();
  EXPECT_EQ(next(early), "state: - 1.6 1.6") << "before the first reading";
  EXPECT_TRUE(eventually([&] { return bus.calls("GetManagedObjects") > 0; }));
  bus.answer("GetManagedObjects", modems_of({{kModemPath, modem()}}));
  tell_modem_changed();
  SocketPeer asleep = observer();
  EXPECT_EQ(next(early, 20s), "sim-status-changed: Ready A1 26202");
  EXPECT_EQ(next(early), "postponement-status-changed: Ready A1 26202");
  SocketPeer late = observer();
  EXPECT_EQ(next(late), "state: Ready A1 26202");
  EXPECT_EQ(next(late), "sim-status-changed: Ready A1 26202");
  EXPECT_EQ(next(late), "postponement-status-changed: Ready A1 26202");
  for (const char* command : {"set", "fail", "succeed", "notify"}) {
    SocketPeer commander = observer();
    commander.send(frame_bytes(wire::FrameKind::call, 1, command, dictionary({{"Field", "iccid"}})));
    std::optional<ReceivedFrame> frame;
    while ((frame = commander.receive()) && frame->kind != wire::FrameKind::failure) continue;
    ASSERT_TRUE(frame) << command;
    EXPECT_EQ(described(frame->value), R"({"Code": 2, "Description": "this telephony service follows a modem"})");
  }
  expect_to_read("A2", "a swap");
  for (SocketPeer* peer : {&early, &late}) {
    for (const char* event : {"sim-newly-inserted", "sim-status-changed", "postponement-status-changed"}) {
      EXPECT_EQ(next(*peer), std::string(event) + ": Ready A2 26202");
    }
  }
  const Outcome called = run_to_end(control_program(), {"sim", "eject"});
  EXPECT_EQ(called.err, "quorvelctl: the telephony service refuses: this telephony service follows a modem\n");
  EXPECT_EQ(run_to_end(control_program(), {"sim", "show"}).status, 0);
  EXPECT_EQ(run_to_end(bridge_program(), {}).status, 69);
  EXPECT_EQ(program->stop().status, 0);
  const std::string log = program->err();
  EXPECT_NE(log.find("following the modem /virtual/first, the only one\n"), std::string::npos) << log;
  EXPECT_NE(
      log.find("told sim-newly-inserted, sim-status-changed, postponement-status-changed for iccid, postponement: "
               "SIM status Ready, card A2, subscriber ...6202\n"),
      std::string::npos)
      << log;
}

TEST_F(Bridge, ReadsOnceForABurstAndNeverTwoCardsAtATime) {
  start();
  SocketPeer watcher = observer();
  EXPECT_TRUE(next(watcher).starts_with("state"));
  EXPECT_EQ(next(watcher), "sim-status-changed: Ready A1 26202");
  EXPECT_EQ(next(watcher), "postponement-status-changed: Ready A1 26202");
  const int before = bus.calls("GetManagedObjects");
  // Signals of no interest, and a burst of those that are.
  bus.send_signal(kModemPath, "org.freedesktop.DBus.Properties", "PropertiesChanged",
                  body("sa{sv}as", kModem, 1, "SignalQuality", "(ub)", 60u, 1, 0));
  bus.send_signal(kModemPath, "org.freedesktop.ModemManager1.Modem.Messaging", "Added", body("ob", "/", 1));
  std::this_thread::sleep_for(600ms);
  EXPECT_EQ(bus.calls("GetManagedObjects"), before);
  for (int i = 0; i < 20; ++i) tell_modem_changed();
  EXPECT_TRUE(eventually([&] { return bus.calls("GetManagedObjects") > before; }));
  // The modem is read, and a signal comes before its card's answer: that is of no use.
  bus.answer(kCardPath, [this, cards_read = 0](sd_bus_message* message) mutable {
    const bool is_first = cards_read++ == 0;
    if (is_first) tell_modem_changed();
    return dictionary_of(card(is_first ? "between two" : "A2"))(message);
  });
  bus.send_signal(kModemPath, "org.freedesktop.DBus.Properties", "PropertiesChanged",
                  body("sa{sv}as", kModem, 0, 1, "Sim"));
  EXPECT_EQ(next(watcher), "sim-newly-inserted: Ready A2 26202");
  EXPECT_LE(bus.calls("GetManagedObjects") - before, 5) << "for each signal of the burst";
  // A signal comes into every reading, and they all say the same.
  bus.answer(kCardPath, [this](sd_bus_message* message) {
    tell_modem_changed();
    return dictionary_of(card("A3"))(message);
  });
  tell_modem_changed();
  EXPECT_TRUE(eventually([] { return field(shown(), "iccid") == "A3"; }));
}

// Each row is something that a bus or a modem service may say; a proper answer behind it is read all the same.
TEST_F(Bridge, OutlivesAHostileBus) {
  struct Attack {
    const char* name;
    std::function<void()> begin;
  };
  const std::string long_text(2'000'000, 'x');
  const auto objects = [&](Append answer) { return [this, answer] { bus.answer("GetManagedObjects", answer); }; };
  const auto of_modem = [&](const std::string& name, Append value) {
    return objects(modems_of({{kModemPath, with(modem(), name, std::move(value))}}));
  };
  const auto of_card = [&](const std::string& name, Append value) {
    return [this, answer = dictionary_of(with(card("X"), name, std::move(value)))] { bus.answer(kCardPath, answer); };
  };
  std::map<std::string, Properties> crowd;
  for (int i = 0; i < 3000; ++i) crowd[kModemPath + std::to_string(i)] = with(modem(), "Sim", variant("o", "/"));
  const std::vector<std::uint8_t> bytes(1'000'000, 7);
  const Append many_bytes = [&](sd_bus_message* message) {
    int result = sd_bus_message_open_container(message, 'v', "ay");
    if (result >= 0) result = sd_bus_message_append_array(message, 'y', bytes.data(), bytes.size());
    return result < 0 ? result : sd_bus_message_close_container(message);
  };
  const Append many_numbers = [](sd_bus_message* message) {
    int result = sd_bus_message_open_container(message, 'v', "as");
    if (result >= 0) result = sd_bus_message_open_container(message, 'a', "s");
    for (int i = 0; i < 100'000 && result >= 0; ++i) result = sd_bus_message_append(message, "s", "+491511234567");
    if (result >= 0) result = sd_bus_message_close_container(message);
    return result < 0 ? result : sd_bus_message_close_container(message);
  };
  const Append deep = body("a{oa{sa{sv}}}", 1, kModemPath.c_str(), 1, kModem, 1, "State", "v", "v", "v", "v", "i", 3);
  const Attack attacks[] = {
      {"an answer of another type", objects(body("s", "hello"))},
      {"an answer without content", objects(body(""))},
      {"an answer with more behind it", objects(body("a{oa{sa{sv}}}s", 0, "more"))},
      {"no modem and no interface", objects(body("a{oa{sa{sv}}}", 1, kModemPath.c_str(), 0))},
      {"a state as a text", of_modem("State", variant("s", "3"))},
      {"a state in variants", objects(deep)},
      {"a state that nobody knows", of_modem("State", variant("i", INT32_MIN))},
      {"a lock that nobody knows", of_modem("UnlockRequired", variant("u", UINT32_MAX))},
      {"a device as a number", of_modem("Device", variant("u", 5u))},
      {"a card at a path that is none", of_modem("Sim", variant("s", "nowhere"))},
      {"a card that is not there", of_modem("Sim", variant("o", "/elsewhere"))},
      {"a long text", of_modem("Revision", variant("s", long_text.c_str()))},
      {"many numbers", of_modem("OwnNumbers", many_numbers)},
      {"numbers that are numbers", of_modem("OwnNumbers", variant("au", 2, 1u, 2u))},
      {"three thousand modems", objects(modems_of(crowd))},
      {"a card of another type", [&] { bus.answer(kCardPath, body("u", 1u)); }},
      {"a card without content", [&] { bus.answer(kCardPath, body("")); }},
      {"an identity as data", of_card("SimIdentifier", variant("ay", 2, 1, 2))},
      {"a group identifier as a text", of_card("Gid1", variant("s", "AB"))},
      {"a million bytes of one", of_card("Gid1", many_bytes)},
      {"control characters", of_card("Imsi", variant("s", "\033[2J\n262"))},
      {"an error for the card", [&] { bus.fail(kCardPath, "org.freedesktop.DBus.Error.UnknownObject"); }},
      {"an error of a strange name", [&] { bus.fail("GetManagedObjects", "a.b"); }},
      {"an error for the modems", [&] { bus.fail("GetManagedObjects", "org.freedesktop.DBus.Error.AccessDenied"); }},
      {"a change without content",
       [&] { bus.send_signal(kModemPath, "org.freedesktop.DBus.Properties", "PropertiesChanged", body("")); }},
      {"an interface added as a number",
       [&] {
         bus.send_signal("/org/freedesktop/ModemManager1", "org.freedesktop.DBus.ObjectManager", "InterfacesAdded",
                         body("u", 1u));
       }},
      {"garbage", [&] { bus.send_bytes(std::string(4096, '\x7f')); }},
      {"a message of 32 MiB that never ends",
       [&] {
         bus.send_bytes({"l\x04\0\x01\0\0\0\x02\x7f\0\0\0\x40\0\0\0", 16});
       }},
      {"a part of a message", [&] { bus.send_bytes("l"), bus.disconnect(); }},
      {"an end", [&] { bus.disconnect(); }},
  };
  start();
  int number = 0;
  for (const Attack& attack : attacks) {
    const std::string name = std::string(attack.name) + "\n";
    const int before = bus.calls("GetManagedObjects");
    attack.begin();
    tell_modem_changed();
    EXPECT_TRUE(eventually([&] { return bus.calls("GetManagedObjects") > before; }, 20s)) << name << program->err();
    EXPECT_TRUE(shown().is_dictionary()) << name << "nobody is answered";
    expect_to_read(std::to_string(++number), name);
  }
  EXPECT_EQ(program->err().find('\033'), std::string::npos);
  EXPECT_EQ(program->stop().status, 0);
}

TEST_F(Bridge, SaysWhyItCannotRead) {
  bus.fail("GetManagedObjects", "org.freedesktop.DBus.Error.AccessDenied");
  start();
  EXPECT_TRUE(eventually([&] { return field(shown(), "iccid") == "2.13"; }));
  EXPECT_EQ(field(shown(), "connection"), "2.13");
  bus.fail("GetManagedObjects", "org.freedesktop.DBus.Error.ServiceUnknown");
  EXPECT_TRUE(eventually([&] { return field(shown(), "iccid") == "1.5"; }));
  bus.fall_silent(true);
  bus.disconnect();
  EXPECT_TRUE(eventually([&] { return field(shown(), "iccid") == "1.6"; }));
  const std::string log = program->err();
  const std::string denied = "cannot read ModemManager: org.freedesktop.DBus.Error.AccessDenied: it fails\n";
  EXPECT_NE(log.find(denied), std::string::npos) << log;
  EXPECT_EQ(log.find(denied), log.rfind(denied)) << "said once:\n" << log;
  EXPECT_NE(log.find("the bus is lost: Connection reset by peer\n"), std::string::npos) << log;
  // A bus that takes connections and says nothing holds up nobody.
  EXPECT_TRUE(shown().is_dictionary());
  bus.fall_silent(false);
  bus.disconnect();
  SocketPeer watcher = observer();
  bus.answer("GetManagedObjects", modems_of({{kModemPath, modem()}}));
  EXPECT_TRUE(next(watcher).starts_with("state"));
  EXPECT_EQ(next(watcher, 40s), "sim-status-changed: Ready A1 26202");
}

TEST_F(Bridge, KnowsLocksStatesAndThePinnedModem) {
  const struct {
    int state;
    unsigned reason, lock;
    const char* told;
  } rows[] = {
      {8, 0, 3, "Ready"},   {11, 0, 5, "Ready"},  {2, 0, 2, "PinRequired"}, {2, 0, 4, "PukRequired"},
      {2, 0, 6, "Locked"},  {2, 0, 16, "Locked"}, {3, 0, 0, "-"},           {-1, 2, 0, "NotInserted"},
      {-1, 3, 0, "Failed"}, {-1, 5, 0, "-"},      {3, 0, 1, "Ready"},
  };
  const auto first = with(with(modem(), "Device", variant("s", "/virtual/other")), "State", variant("i", 11));
  start({"--device", "/virtual/first"});
  for (const auto& row : rows) {
    Properties changed = with(modem(), "State", variant("i", row.state));
    changed["StateFailedReason"] = variant("u", row.reason);
    changed["UnlockRequired"] = variant("u", row.lock);
    bus.answer("GetManagedObjects", modems_of({{kModemPath, changed}, {"/other", first}}));
    const int before = bus.calls("GetManagedObjects");
    tell_modem_changed();
    EXPECT_TRUE(eventually([&] { return bus.calls("GetManagedObjects") > before; }));
    EXPECT_TRUE(eventually([&] { return field(shown(), "sim-status") == row.told; })) << row.state << row.lock;
  }
  bus.answer("GetManagedObjects", modems_of({{"/other", first}}));
  tell_modem_changed();
  EXPECT_TRUE(eventually([&] { return field(shown(), "iccid") == "1.1"; }, 20s));
  EXPECT_NE(program->err().find("no modem /virtual/first; there is /virtual/other\n"), std::string::npos)
      << program->err();
}

}  // namespace
}  // namespace quorvel::test
