#include <cstring>

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

// The beginning of the store keys of one domain. Many domains begin alike, so the end of it is compared first.
class Prefix {
 public:
  explicit Prefix(std::string_view text) noexcept : text_(text), end_(end_of(text)) {}
  [[nodiscard]] bool begins(std::string_view key) const noexcept {
    return key.size() >= text_.size() && end_of(key) == end_ && key.starts_with(text_);
  }

 private:
  [[nodiscard]] std::uint64_t end_of(std::string_view key) const noexcept {
    std::uint64_t end = 0;
    if (text_.size() >= sizeof end) std::memcpy(&end, key.data() + text_.size() - sizeof end, sizeof end);
    return end;
  }

  std::string_view text_;
  std::uint64_t end_;
};

PropertyValue copy_domain_view(const DataArk& ark, std::string_view domain) noexcept QUORVEL_REQUIRES(ark.lock) {
  const Prefix prefix(domain);
  PropertyValue view = PropertyValue::dictionary();
  for (const auto& [key, value] : ark.values.entries()) {
    const std::string_view text = key.text();
    if (!prefix.begins(text)) continue;
    if (!view.set(text.substr(domain.size()), value)) return nullptr;
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
