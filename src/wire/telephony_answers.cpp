#include "wire/telephony_answers.h"

#include <algorithm>
#include <cstdint>
#include <limits>

#include "property/binary/binary.h"
#include "wire/telephony_state.h"

namespace quorvel::wire {

namespace {

[[nodiscard]] std::int32_t error_number(const PropertyValue& value) noexcept {
  using Limits = std::numeric_limits<std::int32_t>;
  if (const auto number = value.to_int64()) {
    return static_cast<std::int32_t>(std::clamp<std::int64_t>(*number, Limits::min(), Limits::max()));
  }
  return value.to_uint64() ? Limits::max() : 0;
}

}  // namespace

PropertyValue state_of(const Frame& frame) noexcept {
  if (frame.head.kind != FrameKind::state && frame.head.kind != FrameKind::event) return nullptr;
  PropertyValue state = read_binary(frame.payload, Mutability::immutable);
  return state.is_dictionary() ? state : PropertyValue();
}

platform::TelephonyError take_answer(const PropertyValue& state, std::string_view field,
                                     PropertyValue& value) noexcept {
  const PropertyValue& answer = state.get(field);
  value = answer.get(kStateValueKey.text());
  return {error_number(answer.get(kStateDomainKey.text())), error_number(answer.get(kStateCodeKey.text()))};
}

}  // namespace quorvel::wire
