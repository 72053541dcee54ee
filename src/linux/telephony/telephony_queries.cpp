// The queries, answered from the state that the service pushed last.
#include "linux/telephony/telephony_center.h"
#include "platform/telephony.h"
#include "wire/telephony_answers.h"
#include "wire/telephony_state.h"

namespace quorvel::platform {

TelephonyConnection TelephonyConnection::open(Callback, void*) noexcept {
  TelephonyConnection connection;
  const TelephonyCenter* center = existing_telephony_center();
  PropertyValue nothing;
  if (center == nullptr || wire::take_answer(center->state(), wire::kConnectionField.text(), nothing).code != 0) {
    return connection;
  }
  connection.state_ = center->state();
  return connection;
}

TelephonyError TelephonyConnection::copy(std::string_view field, PropertyValue& value) const noexcept {
  return wire::take_answer(state_, field, value);
}

TelephonyError TelephonyConnection::copy_sim_identity(PropertyValue& value) const noexcept {
  return copy(wire::kIccidField.text(), value);
}

TelephonyError TelephonyConnection::copy_mobile_subscriber_identity(PropertyValue& value) const noexcept {
  return copy(wire::kImsiField.text(), value);
}

TelephonyError TelephonyConnection::copy_firmware_version(PropertyValue& value) const noexcept {
  return copy(wire::kFirmwareVersionField.text(), value);
}

TelephonyError TelephonyConnection::copy_bootloader_version(PropertyValue& value) const noexcept {
  return copy(wire::kBootloaderVersionField.text(), value);
}

TelephonyError TelephonyConnection::copy_gid1(PropertyValue& value) const noexcept {
  return copy(wire::kGid1Field.text(), value);
}

TelephonyError TelephonyConnection::copy_gid2(PropertyValue& value) const noexcept {
  return copy(wire::kGid2Field.text(), value);
}

TelephonyError TelephonyConnection::copy_postponement_status(PropertyValue& value) const noexcept {
  const TelephonyError error = copy(wire::kPostponementField.text(), value);
  if (!value.is_dictionary()) value = nullptr;
  return error;
}

PropertyValue copy_sim_status() noexcept {
  const TelephonyCenter* center = existing_telephony_center();
  if (center == nullptr) return nullptr;
  PropertyValue status;
  wire::take_answer(center->state(), wire::kSimStatusField.text(), status);
  return status.is_string() ? status : PropertyValue();
}

}  // namespace quorvel::platform
