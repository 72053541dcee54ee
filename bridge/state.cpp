#include "bridge/state.h"

#include <initializer_list>
#include <string_view>
#include <utility>

#include "platform/telephony.h"
#include "wire/telephony_state.h"

namespace quorvel::bridge {
namespace {

using Entry = std::pair<std::string_view, PropertyValue>;

PropertyValue dictionary(std::initializer_list<Entry> entries) {
  PropertyValue result = PropertyValue::dictionary(entries.size());
  for (const auto& [key, value] : entries) {
    if (value && !result.set(key, value)) return nullptr;
  }
  return result;
}

PropertyValue text(const std::string& value) { return PropertyValue::string(value); }
PropertyValue data(const std::string& bytes) {
  return PropertyValue::data({reinterpret_cast<const std::byte*>(bytes.data()), bytes.size()});
}

PropertyValue answer(PropertyValue value) { return dictionary({{wire::kStateValueKey.text(), std::move(value)}}); }

PropertyValue error(int code, int domain = kFindingDomain) {
  return dictionary({{wire::kStateDomainKey.text(), PropertyValue::integer(std::int64_t{domain})},
                     {wire::kStateCodeKey.text(), PropertyValue::integer(std::int64_t{code})}});
}

// Every query fails alike.
PropertyValue failing(const PropertyValue& pair, PropertyValue connection, PropertyValue postponement) {
  return dictionary({{wire::kIccidField.text(), pair},
                     {wire::kImsiField.text(), pair},
                     {wire::kGid1Field.text(), pair},
                     {wire::kGid2Field.text(), pair},
                     {wire::kFirmwareVersionField.text(), pair},
                     {wire::kPostponementField.text(), std::move(postponement)},
                     {wire::kConnectionField.text(), std::move(connection)}});
}

PropertyValue not_ready() {
  return answer(dictionary({{platform::kPostponementStatusKey.text(), platform::kPostponementStatusNotReady}}));
}

// All entries are there always: the daemon never removes one that is left out.
PropertyValue radio_info(const Modem& modem, const std::string& status) {
  const bool has_failed = modem.state == ModemState::failed || modem.state == ModemState::card_error;
  PropertyValue reason;
  if (modem.state == ModemState::card_error) reason = text("SIM error");
  if (modem.state == ModemState::failed) reason = text("modem failed, reason " + std::to_string(modem.failure));
  return answer(dictionary({
      {platform::kPostponementStatusKey.text(),
       has_failed ? PropertyValue(platform::kPostponementStatusError) : text("Ready")},
      {platform::kPostponementErrorReasonKey.text(), std::move(reason)},
      {"IntegratedCircuitCardIdentity", text(modem.iccid)},
      {"InternationalMobileSubscriberIdentity", text(modem.imsi)},
      {"InternationalMobileEquipmentIdentity", text(modem.imei)},
      {"BasebandVersion", text(modem.revision)},
      {"SIMStatus", text(status)},
      {"PhoneNumber", text(modem.numbers.empty() ? "" : modem.numbers.front())},
      {"SIMGID1", data(modem.gid1)},
      {"SIMGID2", data(modem.gid2)},
  }));
}

// Only an empty tray that is certain says with an empty text that there is no identity: the daemon removes the stored
// one on that, and keeps it on an error.
PropertyValue imsi(const Modem& modem, bool is_empty_tray, bool keeps_imsi) {
  if (!modem.imsi.empty() || is_empty_tray || !keeps_imsi) return answer(text(modem.imsi));
  const bool is_locked = modem.lock == CardLock::pin || modem.lock == CardLock::puk || modem.lock == CardLock::other;
  return error(is_locked && !modem.iccid.empty() ? kCardLocked : kCardUnreadable);
}

}  // namespace

std::string sim_status(const Modem& modem) {
  if (modem.state == ModemState::no_card) return wire::kSimStatusNotInserted.c_str();
  if (modem.state == ModemState::card_error) return wire::kSimStatusFailed.c_str();
  if (modem.state != ModemState::running || !modem.has_card) return {};
  switch (modem.lock) {
    case CardLock::unknown: return {};
    case CardLock::none: return wire::kSimStatusReady.c_str();
    case CardLock::pin: return wire::kSimStatusPinRequired.c_str();
    case CardLock::puk: return wire::kSimStatusPukRequired.c_str();
    case CardLock::other: return wire::kSimStatusLocked.c_str();
  }
  return {};
}

bool is_card_present(const std::string& status) {
  return !status.empty() && status != wire::kSimStatusNotInserted.text() && status != wire::kSimStatusFailed.text();
}

PropertyValue state_of(const Reading& reading, const Modem* modem, bool keeps_imsi) {
  if (reading.reach != Reach::running) {
    const PropertyValue pair = reading.reach == Reach::refused    ? error(reading.error, kQuestionDomain)
                               : reading.reach == Reach::bus_lost ? error(kBusLost)
                                                                  : error(kNotRunning);
    return failing(pair, pair, pair);
  }
  if (modem == nullptr) return failing(error(kNoModem), {}, not_ready());
  if (modem->state == ModemState::starting) return failing(error(kModemStarting), {}, not_ready());
  const std::string status = sim_status(*modem);
  const bool is_empty_tray = modem->state == ModemState::no_card;
  const bool is_readable = is_empty_tray || !modem->iccid.empty();
  const auto group = [&](const std::string& gid) {
    return is_readable || !gid.empty() ? answer(data(gid)) : error(kCardUnreadable);
  };
  return dictionary({
      {wire::kSimStatusField.text(), status.empty() ? PropertyValue() : answer(text(status))},
      {wire::kIccidField.text(), is_readable ? answer(text(modem->iccid)) : error(kCardUnreadable)},
      {wire::kImsiField.text(), imsi(*modem, is_empty_tray, keeps_imsi)},
      {wire::kGid1Field.text(), group(modem->gid1)},
      {wire::kGid2Field.text(), group(modem->gid2)},
      {wire::kFirmwareVersionField.text(), modem->revision.empty() ? PropertyValue() : answer(text(modem->revision))},
      {wire::kPostponementField.text(), radio_info(*modem, status)},
  });
}

}  // namespace quorvel::bridge
