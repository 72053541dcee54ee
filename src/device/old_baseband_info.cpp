#include "device/baseband_info.h"
#include "files/value_helpers.h"
#include "log/daemon_log.h"
#include "platform/telephony.h"
#include "store/key_names.h"

namespace quorvel {
namespace {

constexpr const char* kFunction = "lookup_baseband_info_old";

using platform::TelephonyConnection;
using Query = platform::TelephonyError (TelephonyConnection::*)(PropertyValue&) const noexcept;

// What one run's queries delivered; none where nothing was.
struct Facts {
  PropertyValue sim_identity;
  PropertyValue subscriber_identity;
  PropertyValue firmware_version;
  PropertyValue bootloader_version;
  PropertyValue gid1;
  PropertyValue gid2;
};

struct QueryStep {
  const char* name;
  Query query;
  PropertyValue Facts::*slot;
};

constexpr QueryStep kQueries[] = {
    {"_TelvaneServerConnectionCopySIMIdentity", &TelephonyConnection::copy_sim_identity, &Facts::sim_identity},
    {"_TelvaneServerConnectionCopyMobileSubscriberIdentity", &TelephonyConnection::copy_mobile_subscriber_identity,
     &Facts::subscriber_identity},
    {"_TelvaneServerConnectionCopyFirmwareVersion", &TelephonyConnection::copy_firmware_version,
     &Facts::firmware_version},
    {"_TelvaneServerConnectionCopyBootloaderVersion", &TelephonyConnection::copy_bootloader_version,
     &Facts::bootloader_version},
    {"_TelvaneServerConnectionCopyGid1", &TelephonyConnection::copy_gid1, &Facts::gid1},
    {"_TelvaneServerConnectionCopyGid2", &TelephonyConnection::copy_gid2, &Facts::gid2},
};

Facts query_all(const TelephonyConnection& connection) noexcept {
  Facts facts;
  for (const QueryStep& step : kQueries) {
    const platform::TelephonyError error = (connection.*step.query)(facts.*step.slot);
    if (error.code != 0) {
      daemon_log(0, kFunction, "%s() error: %ld.%ld", step.name, long{error.domain}, long{error.code});
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
  data_ark_add_to_class(ark, nullptr, key, 1);
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
  const Facts facts = query_all(connection);
  update_identity(ark, "ICCID", keys::kIntegratedCircuitCardIdentity, facts.sim_identity);
  update_identity(ark, "IMSI", keys::kInternationalMobileSubscriberIdentity, facts.subscriber_identity);
  insert_version(ark, "baseband version", keys::kBasebandVersion, 0, facts.firmware_version);
  store_group_identifier(ark, keys::kSIMGID1, facts.gid1);
  store_group_identifier(ark, keys::kSIMGID2, facts.gid2);
  insert_version(ark, "baseband bootloader version", keys::kBasebandBootloaderVersion, 1, facts.bootloader_version);
}

}  // namespace quorvel
