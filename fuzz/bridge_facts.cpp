// Lives of a bridge: readings made of the input's bytes, one after another, with time going on between them.
#include "bridge/facts.h"
#include "platform/telephony.h"
#include "target.h"
#include "wire/telephony_state.h"

namespace quorvel::fuzz {
namespace {

using namespace bridge;

constexpr int kMostSteps = 200;
constexpr int kStepsBehindTheInput = 4;

std::string text(Input& input) { return std::string(as_text(input.take(input.number(1) % 5))); }

Modem modem(Input& input) {
  Modem made;
  made.device = static_cast<char>('a' + input.number(1) % 3);
  made.state = static_cast<ModemState>(input.number(1) % 5);
  made.failure = static_cast<unsigned>(input.number(1));
  made.lock = static_cast<CardLock>(input.number(1) % 5);
  made.has_card = input.number(1) % 2 != 0;
  for (std::string* field : {&made.iccid, &made.imsi, &made.revision, &made.imei, &made.gid1, &made.gid2}) {
    *field = text(input);
  }
  made.numbers.resize(input.number(1) % 3, text(input));
  return made;
}

// An identity that is told is one of the present modems'.
bool is_known(const PropertyValue& value, std::string Modem::*field, const std::vector<Modem>& modems) {
  if (value.text().empty()) return true;
  for (const Modem& present : modems) {
    if (value.text() == present.*field) return true;
  }
  return false;
}

void check(const Telling& telling, const std::vector<Modem>& modems, bool was_told) {
  if (telling.events.empty()) return;
  require(telling.state.is_dictionary(), "an event without a state");
  require(was_told || telling.events.front() == platform::kSimStatusChanged.text(), "the first event is another");
  require(is_known(telling.state.get("iccid").get("Value"), &Modem::iccid, modems), "a card from nowhere");
  require(is_known(telling.state.get("imsi").get("Value"), &Modem::imsi, modems), "a subscriber from nowhere");
}

}  // namespace

void run_once(Bytes bytes) {
  Input input(bytes.first(bytes.size() < 4096 ? bytes.size() : 4096));
  Facts facts;
  Facts::Clock::time_point now;
  bool was_told = false;
  std::vector<Modem> modems;
  int left = kStepsBehindTheInput;
  for (int step = 0; step < kMostSteps && left > 0; ++step) {
    left -= input.is_used_up() ? 1 : 0;
    now += std::chrono::seconds(input.number(1) % 16);
    Telling telling;
    if (facts.deadline() && *facts.deadline() <= now) {
      telling = facts.take_again(now);
    } else {
      Reading reading{static_cast<Reach>(input.number(1) % 4), {}, 5};
      for (std::uint64_t count = input.number(1) % 3; count > 0; --count) reading.modems.push_back(modem(input));
      modems = reading.modems;
      telling = facts.take(std::move(reading), now);
    }
    check(telling, modems, was_told);
    was_told |= !telling.events.empty();
  }
}

}  // namespace quorvel::fuzz
