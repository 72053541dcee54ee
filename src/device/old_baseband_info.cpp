#include <iterator>

#include "device/baseband_info.h"
#include "files/value_helpers.h"
#include "log/daemon_log.h"
#include "platform/telephony.h"
#include "store/key_class.h"
#include "store/key_names.h"

namespace quorvel {
namespace {

constexpr const char* kFunction = "lookup_baseband_info_old";

using platform::TelephonyConnection;
using platform::TelephonyField;

// The answers of one run, by query; none where nothing was delivered.
struct Facts {
  PropertyValue values[std::size(platform::kTelephonyFields)];
  [[nodiscard]] PropertyValue& operator[](TelephonyField field) noexcept {
    return values[static_cast<std::size_t>(field)];
  }
};

// The radio info is asked for on devices with the other baseband.
Facts query_all(const TelephonyConnection& connection) noexcept {
  Facts facts;
  for (const platform::TelephonyFieldRow& row : platform::kTelephonyFields) {
    if (row.field == TelephonyField::postponement) continue;
    const platform::TelephonyError error = connection.query(row.field, facts[row.field]);
    if (error.code != 0) {
      daemon_log(0, kFunction, "%s() error: %ld.%ld", row.query, long{error.domain}, long{error.code});
    }
  }
  return facts;
}

void update_sim_status(DataArk* ark) noexcept {
  const PropertyValue previous = data_ark_copy(ark, nullptr, keys::kPreviousSIMStatus);
  const PropertyValue current = platform::copy_sim_status();
  if (!previous && !current) return;
  if (!current) {
    daemon_log(0, kFunction, "SIM status has gone away?");
    data_ark_remove(ark, nullptr, keys::kPreviousSIMStatus);
    return;
  }
  if (previous == current) return;
  daemon_log(0, kFunction, "%s", previous ? "The SIM status has changed" : "We now have SIM status");
  data_ark_set(ark, nullptr, keys::kPreviousSIMStatus, current);
}

// Keeps the stored identity of the SIM or the subscriber in step. Only an empty text says that there is none any more;
// no text at all is a query that failed.
void update_identity(DataArk* ark, const char* name, const PropertyValue& key,
                     const PropertyValue& delivered) noexcept {
  const PropertyValue& identity = as_string(delivered);
  if (!identity) return;
  if (identity.text().empty()) {
    if (data_ark_exists(ark, nullptr, key) == 0) return;
    daemon_log(0, kFunction, "The %s has been removed", name);
    data_ark_remove(ark, nullptr, key);
    return;
  }
  const PropertyValue stored = data_ark_copy(ark, nullptr, key);
  if (!stored) {
    daemon_log(0, kFunction, "Inserting %s into the data ark", name);
  } else if (!(stored == identity)) {
    daemon_log(0, kFunction, "The %s has changed", name);
  } else {
    return;
  }
  data_ark_set(ark, nullptr, key, identity);
}

// A version that is stored already is never replaced.
void insert_version(DataArk* ark, const char* name, const PropertyValue& key, unsigned key_class,
                    const PropertyValue& version) noexcept {
  if (version.text().empty() || data_ark_exists(ark, nullptr, key) != 0) return;
  daemon_log(0, kFunction, "Inserting %s into the data ark", name);
  data_ark_add_to_class(ark, nullptr, key, key_class);
  data_ark_set(ark, nullptr, key, version);
}

void store_group_identifier(DataArk* ark, const PropertyValue& key, const PropertyValue& value) noexcept {
  if (!value) return;
  data_ark_add_to_class(ark, nullptr, key, kMemoryOnlyClass);
  data_ark_set(ark, nullptr, key, value);
}

}  // namespace

void lookup_baseband_info_old(DataArk* ark) noexcept {
  update_sim_status(ark);
  post_system_notification(kPhoneNumberChangedNotification);
  const auto connection = TelephonyConnection::open(_telvaneserver_callback, nullptr);
  if (!connection) {
    daemon_log(0, kFunction, "Could not connect to Telvane");
    return;
  }
  Facts facts = query_all(connection);
  update_identity(ark, "ICCID", keys::kIntegratedCircuitCardIdentity, facts[TelephonyField::sim_identity]);
  update_identity(ark, "IMSI", keys::kInternationalMobileSubscriberIdentity,
                  facts[TelephonyField::mobile_subscriber_identity]);
  insert_version(ark, "baseband version", keys::kBasebandVersion, kSavedClass, facts[TelephonyField::firmware_version]);
  store_group_identifier(ark, keys::kSIMGID1, facts[TelephonyField::gid1]);
  store_group_identifier(ark, keys::kSIMGID2, facts[TelephonyField::gid2]);
  insert_version(ark, "baseband bootloader version", keys::kBasebandBootloaderVersion, kMemoryOnlyClass,
                 facts[TelephonyField::bootloader_version]);
}

}  // namespace quorvel
