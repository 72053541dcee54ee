// The commands that change what the simulated telephony service answers.
#pragma once

#include <string>
#include <string_view>

#include "property/value.h"
#include "telephony-service/state_frames.h"

namespace quorvel::tools {

/// Carries out one of the commands set, fail and succeed on `state`; agrees to notify. Returns why it is refused, and
/// nothing has changed then, or an empty text.
[[nodiscard]] std::string carry_out_command(telephony::StateFrames& state, std::string_view command,
                                            const PropertyValue& argument);

}  // namespace quorvel::tools
