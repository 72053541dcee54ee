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

TelephonyError TelephonyConnection::query(TelephonyField field, PropertyValue& value) const noexcept {
  const TelephonyError error = wire::take_answer(state_, row_of(field).name, value);
  if (field == TelephonyField::postponement && !value.is_dictionary()) value = nullptr;
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
