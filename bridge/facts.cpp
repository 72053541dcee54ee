#include "bridge/facts.h"

#include <algorithm>
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

const char* text_of(Reach reach) {
  return reach == Reach::bus_lost ? "the bus is lost" : "the modem service does not run";
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
  if (!pinned_.empty()) std::erase_if(reading_.modems, [this](const Modem& modem) { return modem.device != pinned_; });
  const Modem* chosen = find_chosen();
  // While the chosen modem is away, or comes back, no other takes its place.
  const bool waits = !chosen_.empty() && (chosen == nullptr || chosen->state == ModemState::starting);
  const Modem* modem = reading_.reach != Reach::running ? nullptr : waits ? chosen : find_best();
  const bool is_settled = reading_.reach != Reach::running ? static_cast<bool>(told_)
                                                           : modem != nullptr && modem->state != ModemState::starting;
  if (!is_settled) {
    if (!deadline_) deadline_ = now + (told_ ? kSwapPatience : kStartPatience);
    if (now < *deadline_) return {told_ ? PropertyValue() : state_of(reading_.reach, modem, false), {}, {}};
    modem = reading_.reach == Reach::running ? find_best() : nullptr;
  }
  deadline_.reset();
  if (reading_.reach == Reach::running) chosen_ = modem != nullptr ? modem->device : "";
  return tell(modem);
}

Telling Facts::tell(const Modem* modem) {
  PropertyValue state = state_of(reading_.reach, modem, keeps_imsi(modem));
  if (!state) return {{}, {}, "memory does not suffice for the state"};
  const std::string status = modem != nullptr ? sim_status(*modem) : "";
  std::vector<std::string> list = events(state, modem, status);
  std::string text = list.empty() ? "" : line(list, modem, status);
  remember(state, modem, status);
  return {std::move(state), std::move(list), std::move(text)};
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

std::string Facts::line(const std::vector<std::string>& events, const Modem* modem, const std::string& status) const {
  std::string text = "told ";
  for (const std::string& event : events) text += (&event == &events.front() ? "" : ", ") + event;
  if (reading_.reach != Reach::running) return text + ": " + text_of(reading_.reach);
  if (modem == nullptr) return text + ": no modem";
  text += ": modem " + modem->device;
  if (modem->state == ModemState::starting) return text + " is starting";
  if (modem->state == ModemState::failed) text += " failed, reason " + std::to_string(modem->failure);
  text += ", status " + (status.empty() ? "none" : status);
  if (!is_card_present(status)) return text;
  return text + ", card " + shown(modem->iccid, shows_identities_) + ", subscriber " +
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
