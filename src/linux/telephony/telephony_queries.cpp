// The queries, answered from the state that the service pushed last.
#include <new>
#include <utility>

#include "platform/lock.h"
#include "platform/telephony.h"
#include "wire/telephony_answers.h"
#include "wire/telephony_state.h"

namespace quorvel::platform {

namespace {

struct LastState {
  Lock lock;
  PropertyValue value QUORVEL_GUARDED_BY(lock);
};

// Never destroyed: threads may still ask while the process ends.
LastState& last_state() noexcept {
  alignas(LastState) static unsigned char storage[sizeof(LastState)];
  static auto* const last = ::new (storage) LastState;
  return *last;
}

[[nodiscard]] PropertyValue copy_state() noexcept {
  LastState& last = last_state();
  const LockHold hold(last.lock);
  return last.value;
}

}  // namespace

// What is released here may be large, so the lock is given back before.
void keep_telephony_state(PropertyValue state) noexcept {
  LastState& last = last_state();
  const LockHold hold(last.lock);
  std::swap(last.value, state);
}

TelephonyConnection TelephonyConnection::open(Callback, void*) noexcept {
  TelephonyConnection connection;
  PropertyValue state = copy_state();
  PropertyValue nothing;
  if (wire::take_answer(state, wire::kConnectionField.text(), nothing).code == 0) connection.state_ = std::move(state);
  return connection;
}

TelephonyError TelephonyConnection::query(TelephonyField field, PropertyValue& value) const noexcept {
  const TelephonyError error = wire::take_answer(state_, row_of(field).name, value);
  if (field == TelephonyField::postponement && !value.is_dictionary()) value = nullptr;
  return error;
}

PropertyValue copy_sim_status() noexcept {
  PropertyValue status;
  wire::take_answer(copy_state(), wire::kSimStatusField.text(), status);
  return status.is_string() ? status : PropertyValue();
}

}  // namespace quorvel::platform
