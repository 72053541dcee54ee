// What a bridge tells, and when: each row is one life of a bridge, reading after reading.
#include "bridge/facts.h"

#include "support/values.h"

namespace quorvel::bridge {
namespace {

using namespace test;

Modem ready(const std::string& iccid = "A", const std::string& imsi = "1") {
  Modem modem;
  modem.device = "m";
  modem.state = ModemState::running;
  modem.lock = CardLock::none;
  modem.has_card = true;
  modem.iccid = iccid;
  modem.imsi = imsi;
  modem.revision = "FW";
  modem.numbers = {"+1"};
  return modem;
}

template <typename Change>
Modem with(Modem modem, Change change) {
  change(modem);
  return modem;
}

Modem locked(CardLock lock, const std::string& iccid) {
  return with(ready(iccid, ""), [&](Modem& modem) { modem.lock = lock; });
}
Modem in_state(ModemState state, unsigned failure = 0) {
  Modem modem;
  modem.device = "m";
  modem.state = state;
  modem.failure = failure;
  return modem;
}
Modem called(const std::string& device, Modem modem) {
  modem.device = device;
  return modem;
}

Reading of(std::vector<Modem> modems) { return {Reach::running, std::move(modems), 0}; }
const Reading kNotRunningNow = {Reach::not_running, {}, 0};
const Reading kBusLostNow = {Reach::bus_lost, {}, 0};
const Reading kRefusedNow = {Reach::refused, {}, 13};

std::string field(const PropertyValue& state, const char* name) {
  const PropertyValue& entry = state.get(name);
  if (!entry) return "-";
  if (entry.get("Code")) return described(entry.get("Domain")) + "." + described(entry.get("Code"));
  const std::string text = described(entry.get("Value"));
  return text == "<0 bytes>" ? "<>" : text;
}

// The events by their initials, the SIM status, ICCID, IMSI, GID1, firmware version and connection.
std::string described_telling(const Telling& telling) {
  static const std::map<std::string, std::string> initials = {{"sim-newly-inserted", "I"},
                                                              {"sim-status-changed", "S"},
                                                              {"phone-number-changed", "N"},
                                                              {"postponement-status-changed", "P"}};
  std::string text;
  for (const std::string& event : telling.events) text += initials.at(event);
  if (text.empty()) return "";
  for (const char* name : {"sim-status", "iccid", "imsi", "gid1", "firmware-version", "connection"}) {
    text += " " + field(telling.state, name);
  }
  return text;
}

struct Step {
  int second;
  std::optional<Reading> reading;  // none: the clock alone goes on
  std::string told;
};

struct Life {
  const char* name;
  std::vector<Step> steps;
};

const std::string kReadyA = " Ready A 1 <> FW -";
const std::string kReadyB = " Ready B 2 <> FW -";
const std::string kEmptyTray = " NotInserted   <> - -";
const std::string kNone = " - 1.1 1.1 1.1 1.1 -";
const std::string kGone = " - 1.5 1.5 1.5 1.5 1.5";

const Life kLives[] = {
    {"a modem at once, the same again, a swap",
     {{0, of({ready()}), "SP" + kReadyA},
      {1, of({ready()}), ""},
      {2, of({}), ""},
      {5, of({ready("B", "2")}), "ISP" + kReadyB}}},
    {"an ejection, the same card again, another one",
     {{0, of({ready()}), "SP" + kReadyA},
      {1, of({in_state(ModemState::no_card, 2)}), "SP" + kEmptyTray},
      {2, of({ready()}), "ISP" + kReadyA},
      {3, of({ready("B", "2")}), "ISP" + kReadyB}}},
    {"a start without a modem is told after thirty seconds",
     {{0, kNotRunningNow, ""},
      {10, of({}), ""},
      {29, std::nullopt, ""},
      {30, std::nullopt, "SP" + kNone},
      {31, of({ready()}), "ISP" + kReadyA}}},
    {"a modem that starts for ever",
     {{0, of({in_state(ModemState::starting)}), ""}, {30, std::nullopt, "SP - 1.4 1.4 1.4 1.4 -"}}},
    {"unplugged for ten seconds, and the same card back",
     {{0, of({ready()}), "SP" + kReadyA},
      {1, of({}), ""},
      {10, of({in_state(ModemState::starting)}), ""},
      {11, std::nullopt, "SP - 1.4 1.4 1.4 1.4 -"},
      {12, of({ready()}), "SP" + kReadyA}}},
    {"the service goes and comes back, the bus as well",
     {{0, of({ready()}), "SP" + kReadyA},
      {1, kNotRunningNow, "SP" + kGone},
      {2, of({}), ""},
      {4, of({ready()}), "SP" + kReadyA},
      {5, kBusLostNow, "SP - 1.6 1.6 1.6 1.6 1.6"},
      {6, kBusLostNow, ""},
      {7, kNotRunningNow, "SP" + kGone},
      {8, kRefusedNow, "SP - 2.13 2.13 2.13 2.13 2.13"},
      {9, of({ready()}), "SP" + kReadyA}}},
    {"an IMSI never outlives its card",
     {{0, of({ready()}), "SP" + kReadyA},
      {1, of({locked(CardLock::pin, "A")}), "SP PinRequired A 1.2 <> FW -"},
      {2, of({locked(CardLock::pin, "B")}), "ISP PinRequired B  <> FW -"},
      {3, of({locked(CardLock::puk, "B")}), "SP PukRequired B  <> FW -"},
      {4, of({ready("B", "2")}), "SP" + kReadyB},
      {5, of({locked(CardLock::none, "B")}), "SP Ready B 1.3 <> FW -"},
      {6, of({locked(CardLock::other, "A")}), "ISP Locked A  <> FW -"}}},
    {"a locked card first", {{0, of({locked(CardLock::pin, "A")}), "SP PinRequired A  <> FW -"}}},
    {"a card that cannot be read keeps what is stored",
     {{0, of({ready()}), "SP" + kReadyA},
      {1, of({ready("", "")}), "SP Ready 1.3 1.3 1.3 FW -"},
      {2, of({ready()}), "SP" + kReadyA},
      {3, of({in_state(ModemState::no_card, 2)}), "SP" + kEmptyTray},
      {4, of({ready("", "")}), "ISP Ready 1.3 1.3 1.3 FW -"}}},
    {"group identifiers, a number, a firmware version",
     {{0, of({ready()}), "SP" + kReadyA},
      {1,
       of({with(ready(),
                [](Modem& modem) {
                  modem.numbers = {"+1", "+2"};
                })}),
       "N" + kReadyA},
      {2, of({with(ready(), [](Modem& modem) { modem.numbers = {"+3"}; })}), "NP" + kReadyA},
      {3, of({with(ready(), [](Modem& modem) { modem.numbers = {"+3"}, modem.gid1 = "\xab"; })}),
       "SP Ready A 1 <ab 1 byte> FW -"},
      {4, of({with(ready(), [](Modem& modem) { modem.revision = ""; })}), "SP Ready A 1 <> - -"}}},
    {"failures",
     {{0, of({in_state(ModemState::card_error, 3)}), "SP Failed 1.3 1.3 1.3 - -"},
      {1, of({in_state(ModemState::failed, 4)}), "SP - 1.3 1.3 1.3 - -"},
      {2, of({in_state(ModemState::failed, 1)}), "P - 1.3 1.3 1.3 - -"},
      {3, of({locked(CardLock::unknown, "A")}), "SP - A  <> FW -"}}},
    {"two modems: the card decides, then the last choice, and a swap is waited for",
     {{0, of({called("a", in_state(ModemState::no_card, 2)), called("b", ready())}), "SP" + kReadyA},
      {1, of({called("a", ready("B", "2")), called("b", ready())}), ""},
      {2, of({called("a", ready("B", "2"))}), ""},
      {3, of({called("a", ready("B", "2")), called("b", in_state(ModemState::starting))}), ""},
      {4, of({called("a", ready("B", "2")), called("b", ready("C", "3"))}), "ISP Ready C 3 <> FW -"},
      {5, of({called("a", ready("B", "2"))}), ""},
      {15, std::nullopt, "ISP" + kReadyB}}},
};

TEST(Facts, TellsWhatChanged) {
  for (const Life& life : kLives) {
    Facts facts;
    const Facts::Clock::time_point start;
    for (const Step& step : life.steps) {
      const auto now = start + std::chrono::seconds(step.second);
      Telling telling;
      if (step.reading) {
        telling = facts.take(*step.reading, now);
      } else if (facts.deadline() && *facts.deadline() <= now) {
        telling = facts.take_again(now);
      }
      EXPECT_EQ(described_telling(telling), step.told) << life.name << ", second " << step.second;
    }
  }
}

TEST(Facts, FollowsThePinnedDeviceAndHidesIdentities) {
  Facts facts("b");
  const Telling telling =
      facts.take(of({called("a", ready("12345", "6")), called("b", ready("8949353", "262021"))}), {});
  EXPECT_EQ(telling.lines, std::vector<std::string>(
                               {"following the modem b, as --device says", "also there: the modem a (SIM status Ready)",
                                "told sim-status-changed, postponement-status-changed for the first time: SIM "
                                "status Ready, card ...9353, subscriber ...2021"}));
  EXPECT_TRUE(Facts({}, true)
                  .take(of({ready("8949353", "262021")}), {})
                  .lines.back()
                  .ends_with(", card 8949353, subscriber 262021"));
  Facts two;
  const Telling chosen = two.take(of({called("a", in_state(ModemState::no_card, 2)), called("b", ready())}), {});
  EXPECT_TRUE(chosen.lines.front().starts_with("following the modem b, the best of ")) << chosen.lines.front();
  EXPECT_EQ(two.take(of({called("a", ready("B", "2"))}), {}).lines,
            std::vector<std::string>({"waiting up to 10 s for the modem b, which went away"}));
  EXPECT_EQ(described(telling.state.get("postponement").get("Value")),
            R"({"Status": "Ready", "IntegratedCircuitCardIdentity": "8949353", )"
            R"("InternationalMobileSubscriberIdentity": "262021", "InternationalMobileEquipmentIdentity": "", )"
            R"("BasebandVersion": "FW", "SIMStatus": "Ready", "PhoneNumber": "+1", "SIMGID1": <0 bytes>, )"
            R"("SIMGID2": <0 bytes>})");
}

}  // namespace
}  // namespace quorvel::bridge
