#include "sim_state.h"

#include <algorithm>
#include <cstdint>
#include <iterator>
#include <limits>

#include "wire/telephony_state.h"

namespace quorvel::tools {
namespace {

bool is_error_number(const PropertyValue& value) noexcept {
  const std::optional<std::int64_t> number = value.to_int64();
  return number && *number >= std::numeric_limits<std::int32_t>::min() &&
         *number <= std::numeric_limits<std::int32_t>::max();
}

// Puts `value` under `key`, or takes the key away when there is no value.
bool put(PropertyValue& entry, std::string_view key, const PropertyValue& value) noexcept {
  if (value) return entry.set(key, value);
  static_cast<void>(entry.remove(key));
  return true;
}

std::string change_entry(std::string_view command, std::string_view field, const PropertyValue& argument,
                         PropertyValue& entry) {
  using namespace wire;
  if (command == kSetCommand) {
    if (field == kConnectionField.text()) return "the connection has no value; it can fail and succeed";
    return put(entry, kStateValueKey.text(), argument.get(kStateValueKey.text())) ? "" : "memory does not suffice";
  }
  if (field == kSimStatusField.text()) return "the SIM status cannot fail; it has a value or none";
  PropertyValue domain;
  PropertyValue code;
  if (command == kFailCommand) {
    domain = argument.get(kStateDomainKey.text());
    code = argument.get(kStateCodeKey.text());
    if (!is_error_number(domain) || !is_error_number(code)) return "an error pair is two 32-bit integers";
  }
  const bool done = put(entry, kStateDomainKey.text(), domain) && put(entry, kStateCodeKey.text(), code);
  return done ? "" : "memory does not suffice";
}

}  // namespace

std::string carry_out_command(telephony::StateFrames& state, std::string_view command, const PropertyValue& argument) {
  if (command == wire::kNotifyCommand) return {};
  if (command != wire::kSetCommand && command != wire::kFailCommand && command != wire::kSucceedCommand) {
    return "there is no such command";
  }
  const std::string_view field = argument.get(wire::kCommandFieldKey.text()).text();
  if (std::find(std::begin(wire::kStateFields), std::end(wire::kStateFields), field) == std::end(wire::kStateFields)) {
    return "there is no such field";
  }
  PropertyValue changed = state.value();
  PropertyValue entry = changed.get(field) ? changed.get(field) : PropertyValue::dictionary();
  std::string refusal = change_entry(command, field, argument, entry);
  if (!refusal.empty()) return refusal;
  if (!put(changed, field, entry.size() > 0 ? entry : PropertyValue())) return "memory does not suffice";
  return state.replace(changed) ? "" : "the state would become too large or too deep to be sent";
}

}  // namespace quorvel::tools
