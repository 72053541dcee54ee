// What the telephony service pushed last. Nobody is asked, so nobody is waited for.
#include "platform/telephony.h"

#include "linux/device/sources/reading.h"
#include "linux/device/sources/sources.h"
#include "platform/device_questions.h"

namespace quorvel::platform::host {

namespace {

constexpr char kRadioInfo[] = "telephony service: postponement";

// A value beside an error is not believed.
[[nodiscard]] PropertyValue value_of(TelephonyField field) noexcept {
  const auto connection = TelephonyConnection::open(nullptr, nullptr);
  PropertyValue value;
  const bool succeeded = connection && connection.query(field, value).code == 0;
  return succeeded ? value : PropertyValue();
}

[[nodiscard]] DeviceAnswer radio_info(std::string_view key) noexcept {
  const PropertyValue info = value_of(TelephonyField::postponement);
  return text_answer(first_text(info.get(key).text()), kRadioInfo);
}

}  // namespace

DeviceAnswer baseband_firmware() noexcept {
  const PropertyValue version = value_of(TelephonyField::firmware_version);
  return text_answer(first_text(version.text()), "telephony service: firmware-version");
}

DeviceAnswer equipment_identity() noexcept { return radio_info(QuestionName("InternationalMobileEquipmentIdentity")); }

DeviceAnswer radio_status() noexcept { return radio_info(kPostponementStatusKey.text()); }

DeviceAnswer subscriber_country() noexcept {
  const PropertyValue identity = value_of(TelephonyField::mobile_subscriber_identity);
  return text_answer(country_code(identity.text()), "telephony service: imsi");
}

}  // namespace quorvel::platform::host
