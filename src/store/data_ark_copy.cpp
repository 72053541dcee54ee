#include "files/value_helpers.h"
#include "log/daemon_log.h"
#include "platform/device_information.h"
#include "store/data_ark.h"
#include "store/data_ark_record.h"
#include "store/live_answers.h"

namespace quorvel {

namespace {

// Outside the store lock: an answer that takes its time holds up nobody.
PropertyValue copy_live_answer(const larry_info& row) noexcept {
  PropertyValue answer = platform::copy_device_answer(row.question);
  if (!answer) {
    const bool is_regular = row.question_name.empty();
    daemon_log(0, "data_ark_copy_with_conn_state", "the device-information service returned nothing for %s%s",
               is_regular ? kQuestionNamePrefix : std::string_view{}, is_regular ? row.question : row.question_name);
  }
  return answer;
}

PropertyValue copy_domain_view(const DataArk& ark, std::string_view prefix) noexcept QUORVEL_REQUIRES(ark.lock) {
  PropertyValue view = PropertyValue::dictionary();
  for (const auto& [key, value] : ark.values.entries()) {
    if (!key.text().starts_with(prefix)) continue;
    if (!view.set(key.text().substr(prefix.size()), value)) return nullptr;
  }
  return view;
}

}  // namespace

PropertyValue data_ark_copy(DataArk* ark, const PropertyValue& domain, const PropertyValue& key) noexcept {
  if (const larry_info* row = find_live_answer(domain, key)) return copy_live_answer(*row);
  const StoreKey store_key(domain, key);
  if (!store_key) return nullptr;
  const LockHold hold(ark->lock);
  if (!ark->values) return nullptr;
  if (store_key.has_key()) return ark->values.get(store_key.hashed());
  return copy_domain_view(*ark, store_key.text());
}

}  // namespace quorvel
