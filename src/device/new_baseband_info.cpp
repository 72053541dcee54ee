#include "device/baseband_info.h"
#include "files/value_helpers.h"
#include "log/daemon_log.h"
#include "platform/telephony.h"
#include "store/key_class.h"
#include "store/key_names.h"

namespace quorvel {
namespace {

constexpr const char* kLookup = "lookup_baseband_info_new";
constexpr const char* kCopy = "copyPostponementStuff";

void store_entry(const PropertyValue& key, const PropertyValue& value, void* context) noexcept {
  auto* ark = static_cast<DataArk*>(context);
  data_ark_add_to_class(ark, nullptr, key, kMemoryOnlyClass);
  data_ark_set(ark, nullptr, key, value);
  daemon_log(0, "__lookup_baseband_info_new_block_invoke", "got %@ = %@ from telvane", key, value);
}

// Takes entries out of a dictionary that nobody else refers to, which cannot fail.
template <class... Keys>
void take_out(PropertyValue& dictionary, const Keys&... keys) noexcept {
  (static_cast<void>(dictionary.remove(keys.text())), ...);
}

}  // namespace

PropertyValue copyPostponementStuff(PropertyValue* status) noexcept {
  const auto connection = platform::TelephonyConnection::open(_telvaneserver_callback, nullptr);
  if (!connection) {
    daemon_log(0, kCopy, "Can't connect to Telvane");
    return {};
  }
  PropertyValue info;
  const platform::TelephonyError error = connection.query(platform::TelephonyField::postponement, info);
  if (error.code != 0) {
    daemon_log(0, kCopy, "%s() error: %ld.%ld", platform::row_of(platform::TelephonyField::postponement).query,
               long{error.domain}, long{error.code});
    return {};
  }
  if (!info) {
    daemon_log(0, kCopy, "Telvane returned NULL postponement");
    return {};
  }
  const PropertyValue radio_status = info.get(platform::kPostponementStatusKey.text());
  if (!radio_status) {
    daemon_log(0, kCopy, "No status in postponement info");
    return {};
  }
  if (radio_status == platform::kPostponementStatusError) {
    daemon_log(0, kCopy, "Telvane reports error: %@", info.get(platform::kPostponementErrorReasonKey.text()));
    return {};
  }
  if (status != nullptr) *status = radio_status;
  PropertyValue copy = make_mutable(std::move(info));
  take_out(copy, platform::kPostponementStatusKey, platform::kPostponementErrorReasonKey);
  return copy;
}

void lookup_baseband_info_new(DataArk* ark) noexcept {
  PropertyValue status;
  PropertyValue info = copyPostponementStuff(&status);
  post_system_notification(kPhoneNumberChangedNotification);
  if (!status) {
    daemon_log(0, kLookup, "radio not responding");
  } else if (status == platform::kPostponementStatusNotReady) {
    daemon_log(0, kLookup, "radio not ready: %@", status);
  } else {
    daemon_log(0, kLookup, "throwing some postponement into ark, radio status: %@", status);
    take_out(info, keys::kIntegratedCircuitCardIdentity, keys::kMobileEquipmentIdentifier,
             keys::kInternationalMobileEquipmentIdentity);
    dict_for_each(info, store_entry, ark);
  }
}

}  // namespace quorvel
