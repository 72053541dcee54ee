#include "sim_state.h"

#include <algorithm>
#include <cstdint>
#include <iterator>
#include <limits>

#include "wire/frame.h"
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

SimState::SimState() : state_(PropertyValue::dictionary()) {}

std::string SimState::change(std::string_view command, const PropertyValue& argument) {
  const std::string_view field = argument.get(wire::kCommandFieldKey.text()).text();
  if (std::find(std::begin(wire::kStateFields), std::end(wire::kStateFields), field) == std::end(wire::kStateFields)) {
    return "there is no such field";
  }
  PropertyValue changed = state_;
  PropertyValue entry = changed.get(field) ? changed.get(field) : PropertyValue::dictionary();
  std::string refusal = change_entry(command, field, argument, entry);
  if (!refusal.empty()) return refusal;
  if (!put(changed, field, entry.size() > 0 ? entry : PropertyValue())) return "memory does not suffice";
  SharedFrame frame = frame_of(changed, {});
  if (!frame) return "the state would become too large or too deep to be sent";
  state_ = std::move(changed);
  frames_.clear();
  frames_.emplace(std::string(), std::move(frame));
  return {};
}

SharedFrame SimState::state_frame() { return event_frame({}); }

SharedFrame SimState::event_frame(const std::string& notification) {
  SharedFrame& frame = frames_[notification];
  if (!frame) frame = frame_of(state_, notification);
  return frame;
}

SharedFrame SimState::frame_of(const PropertyValue& state, const std::string& notification) const {
  const wire::FrameKind kind = notification.empty() ? wire::FrameKind::state : wire::FrameKind::event;
  auto frame = std::make_shared<ByteBuffer>();
  if (!wire::append_frame(kind, 0, 0, notification, state, *frame)) return nullptr;
  constexpr std::size_t kLimit = wire::kMaximumStateBody - wire::kMaximumNameLength;
  return frame->size() <= kLimit ? frame : nullptr;
}

}  // namespace quorvel::tools
