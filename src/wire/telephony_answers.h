// What the telephony service says: its state taken out of a frame, and the answers taken out of the state. Pure
// functions over what a stranger sends.
#pragma once

#include <string_view>

#include "platform/telephony.h"
#include "property/value.h"
#include "wire/frame.h"

namespace quorvel::wire {

/// The whole state that a frame from the service carries, a dictionary. None for what the service cannot have meant to
/// send, and when memory runs out. Any thread.
[[nodiscard]] PropertyValue state_of(const Frame& frame) noexcept;

/// Fills `value` with a field's value in `state`, which may be none and of any kind, and returns the field's error
/// pair: a number that is no integer counts as 0, one out of range as the nearest limit. Any thread.
platform::TelephonyError take_answer(const PropertyValue& state, std::string_view field, PropertyValue& value) noexcept;

}  // namespace quorvel::wire
