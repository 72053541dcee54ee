#include "device/telephony_facts.h"

#include "device/baseband_info.h"
#include "device/device_type.h"
#include "log/daemon_log.h"

namespace quorvel {
namespace {

constexpr const char* kRegister = "registerForTelvaneCallNotifications";

void observe(platform::TelephonyCenter* center, DataArk* ark, const PropertyValue& name) noexcept {
  if (platform::add_telephony_observer(center, ark, phone_center_callback, name)) return;
  daemon_log(0, kRegister, "Could not observe %@", name);
}

}  // namespace

void registerForTelvaneCallNotifications(DataArk* ark) noexcept {
  platform::TelephonyCenter* center = platform::default_telephony_center();
  if (center == nullptr) {
    daemon_log(0, kRegister, "Could not get the Telvane phone center");
    return;
  }
  if (has_new_baseband()) {
    observe(center, ark, platform::kPostponementStatusChanged);
  } else {
    observe(center, ark, platform::kSimNewlyInserted);
    observe(center, ark, platform::kSimStatusChanged);
    observe(center, ark, platform::kPhoneNumberChanged);
  }
  daemon_log(0, kRegister, "now listening for Telvane notifications");
}

void phone_center_callback(platform::TelephonyCenter*, void* context, const PropertyValue& name, const PropertyValue&,
                           const PropertyValue&) noexcept {
  if (!has_new_baseband() && name == platform::kSimNewlyInserted) {
    post_system_notification(kPhoneNumberChangedNotification);
  }
  lookup_baseband_info(static_cast<DataArk*>(context));
}

void lookup_baseband_info(DataArk* ark) noexcept {
  if (has_new_baseband()) {
    lookup_baseband_info_new(ark);
  } else {
    lookup_baseband_info_old(ark);
  }
}

void _telvaneserver_callback(void*) noexcept { daemon_log(0, "_telvaneserver_callback", "_telvaneserver_callback?"); }

}  // namespace quorvel
