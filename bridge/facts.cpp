#include "bridge/facts.h"

#include <algorithm>
#include <cstring>
#include <tuple>

#include "bridge/state.h"
#include "platform/telephony.h"
#include "wire/telephony_state.h"

namespace quorvel::bridge {
namespace {

// A swap takes a modem away for three to six seconds; probing after the machine's start takes longer.
constexpr auto kSwapPatience = std::chrono::seconds(10);
constexpr auto kStartPatience = std::chrono::seconds(30);

int rank(const Modem& modem) {
  const std::string status = sim_status(modem);
  if (status == wire::kSimStatusReady.text()) return 0;
  return is_card_present(status) ? 1 : 2;
}

std::string shown(const std::string& identity, bool in_full) {
  if (identity.empty()) return "unknown";
  return in_full || identity.size() <= 4 ? identity : "..." + identity.substr(identity.size() - 4);
}

std::string text_of(const Reading& reading) {
  if (reading.reach == Reach::bus_lost) return "the bus is lost";
  if (reading.reach == Reach::not_running) return "the modem service does not run";
  return std::string("the modem service does not answer: ") + std::strerror(reading.error);
}

std::string text_of(const Modem& modem) {
  const std::string status = sim_status(modem);
  if (modem.state == ModemState::starting) return "the modem is starting";
  if (modem.state == ModemState::failed) return "the modem failed, reason " + std::to_string(modem.failure);
  return "SIM status " + (status.empty() ? "none" : status);
}

std::string list_of(const std::vector<std::string>& words) {
  std::string list;
  for (const std::string& word : words) list += (list.empty() ? "" : ", ") + word;
  return list;
}

std::string devices_of(const Reading& reading) {
  std::vector<std::string> devices;
  for (const Modem& modem : reading.modems) devices.push_back(modem.device);
  return list_of(devices);
}

}  // namespace

const Modem* Facts::find_chosen() const {
  const auto found = std::find_if(reading_.modems.begin(), reading_.modems.end(),
                                  [this](const Modem& modem) { return modem.device == chosen_; });
  return found == reading_.modems.end() ? nullptr : &*found;
}

const Modem* Facts::find_best() const {
  const Modem* best = nullptr;
  const auto key = [this](const Modem& modem) {
    return std::tuple(rank(modem), modem.device != chosen_, std::string_view(modem.device));
  };
  for (const Modem& modem : reading_.modems) {
    if (!pinned_.empty() && modem.device != pinned_) continue;
    if (best == nullptr || key(modem) < key(*best)) best = &modem;
  }
  return best;
}

// An IMSI never outlives its card: the stored one stays only while the card is the same, or cannot be told apart.
bool Facts::keeps_imsi(const Modem* modem) const {
  return modem != nullptr && (modem->iccid.empty() || modem->iccid == imsi_card_);
}

Telling Facts::take(Reading reading, Clock::time_point now) {
  reading_ = std::move(reading);
  const Modem* chosen = find_chosen();
  // While the chosen modem is away, or comes back, no other takes its place.
  const bool waits = !chosen_.empty() && (chosen == nullptr || chosen->state == ModemState::starting);
  const Modem* modem = reading_.reach != Reach::running ? nullptr : waits ? chosen : find_best();
  const bool is_settled = reading_.reach != Reach::running ? static_cast<bool>(told_)
                                                           : modem != nullptr && modem->state != ModemState::starting;
  if (!is_settled) {
    if (!deadline_ || now < *deadline_) return wait(chosen, now);
    modem = reading_.reach == Reach::running ? find_best() : nullptr;
  }
  return tell(modem);
}

// Before the first telling the state goes along with each reading, so that whoever asks sees why there is nothing.
Telling Facts::wait(const Modem* modem, Clock::time_point now) {
  Telling telling{told_ ? PropertyValue() : state_of(reading_, find_best(), false), {}, {}};
  if (deadline_) return telling;
  const std::chrono::seconds patience = told_ ? kSwapPatience : kStartPatience;
  deadline_ = now + patience;
  const std::string who = chosen_.empty() ? "a modem" : "the modem " + chosen_;
  const std::string why = modem != nullptr ? ", which is starting" : chosen_.empty() ? "" : ", which went away";
  telling.lines = {"waiting up to " + std::to_string(patience.count()) + " s for " + who + why};
  return telling;
}

Telling Facts::tell(const Modem* modem) {
  const bool waited = deadline_.has_value();
  deadline_.reset();
  const std::string status = modem != nullptr ? sim_status(*modem) : "";
  Telling telling{state_of(reading_, modem, keeps_imsi(modem)), {}, {}};
  if (!telling.state) return {{}, {}, {"memory does not suffice for the state"}};
  telling.events = events(telling.state, modem, status);
  if (reading_.reach == Reach::running) {
    const std::string device = modem != nullptr ? modem->device : "";
    if (device != chosen_) telling.lines.push_back(choice(modem));
    chosen_ = device;
    std::string others = others_than(modem);
    if (!others.empty() && others != others_) telling.lines.push_back("also there: " + others);
    others_ = std::move(others);
  }
  if (!telling.events.empty()) telling.lines.push_back(told_line(telling, modem, status));
  if (telling.events.empty() && waited) telling.lines.emplace_back("nothing has changed");
  remember(telling.state, modem, status);
  return telling;
}

std::vector<std::string> Facts::events(const PropertyValue& state, const Modem* modem,
                                       const std::string& status) const {
  const auto differs = [&](std::string_view field) { return !(state.get(field) == told_.get(field)); };
  std::vector<std::string> list;
  const bool is_another_card =
      modem != nullptr &&
      (modem->iccid.empty() ? told_status_ == wire::kSimStatusNotInserted.text() : modem->iccid != known_card_);
  if (told_ && is_card_present(status) && is_another_card) list.emplace_back(platform::kSimNewlyInserted.text());
  const bool has_new_facts =
      std::any_of(std::begin(wire::kStateFields), std::end(wire::kStateFields),
                  [&](std::string_view field) { return field != wire::kPostponementField.text() && differs(field); });
  if (!told_ || has_new_facts) list.emplace_back(platform::kSimStatusChanged.text());
  if (list.empty() && modem != nullptr && modem->numbers != told_numbers_) {
    list.emplace_back(platform::kPhoneNumberChanged.text());
  }
  if (!told_ || differs(wire::kPostponementField.text())) {
    list.emplace_back(platform::kPostponementStatusChanged.text());
  }
  return list;
}

std::string Facts::missing() const {
  if (pinned_.empty()) return "";
  return " " + pinned_ + (reading_.modems.empty() ? "" : "; there is " + devices_of(reading_));
}

// Which modem is followed from now on, and why it and no other.
std::string Facts::choice(const Modem* modem) const {
  if (modem == nullptr) return "following no modem any more";
  const std::string text = "following the modem " + modem->device + ", ";
  if (!pinned_.empty()) return text + "as --device says";
  return text + (reading_.modems.size() == 1 ? "the only one" : "the best of " + devices_of(reading_));
}

std::string Facts::others_than(const Modem* modem) const {
  std::vector<std::string> others;
  for (const Modem& other : reading_.modems) {
    if (&other != modem) others.push_back("the modem " + other.device + " (" + text_of(other) + ")");
  }
  return list_of(others);
}

std::string Facts::told_line(const Telling& telling, const Modem* modem, const std::string& status) const {
  std::vector<std::string> changed;
  for (const std::string_view field : wire::kStateFields) {
    if (!(telling.state.get(field) == told_.get(field))) changed.emplace_back(field);
  }
  if (modem != nullptr && modem->numbers != told_numbers_) changed.emplace_back("numbers");
  const std::string why = told_ ? " for " + list_of(changed) : " for the first time";
  const std::string text = "told " + list_of(telling.events) + why + ": ";
  if (reading_.reach != Reach::running) return text + text_of(reading_);
  if (modem == nullptr) return text + "no modem" + missing();
  if (!is_card_present(status)) return text + text_of(*modem);
  return text + text_of(*modem) + ", card " + shown(modem->iccid, shows_identities_) + ", subscriber " +
         shown(modem->imsi, shows_identities_);
}

void Facts::remember(const PropertyValue& state, const Modem* modem, const std::string& status) {
  told_ = state;
  told_status_ = status;
  if (modem == nullptr) return;
  told_numbers_ = modem->numbers;
  const bool is_empty_tray = modem->state == ModemState::no_card;
  if (is_empty_tray || !modem->iccid.empty()) known_card_ = modem->iccid;
  const bool tells_imsi = is_empty_tray || !modem->imsi.empty() || !keeps_imsi(modem);
  if (tells_imsi) imsi_card_ = modem->imsi.empty() ? "" : modem->iccid;
}

}  // namespace quorvel::bridge
