// What the telephony service says: its state taken out of a frame, and the answers taken out of the state. Pure
// functions over what a stranger sends.
#pragma once

#include <string_view>

#include "platform/property/value.h"
#include "platform/telephony.h"
#include "platform/wire/frame.h"

namespace quorvel::platform::host {

/// The whole state that a frame from the service carries, a dictionary. None for what the service cannot have meant to
/// send, and when memory runs out. Any thread.
[[nodiscard]] PropertyValue state_of(const wire::Frame& frame) noexcept;

/// Fills `value` with a field's value in `state`, which may be none and of any kind, and returns the field's error
/// pair: a number that is no integer counts as 0, one out of range as the nearest limit. Any thread.
TelephonyError take_answer(const PropertyValue& state, std::string_view field, PropertyValue& value) noexcept;

}  // namespace quorvel::platform::host
