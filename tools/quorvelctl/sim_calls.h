// Calls to the simulated telephony service. Each throws Failure when it comes to nothing.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <string>
#include <string_view>
#include <utility>

#include "property/value.h"

namespace quorvel::tools {

[[nodiscard]] PropertyValue simulator_state();

/// Gives a field a value, or with none takes it away.
void set_field(std::string_view field, const PropertyValue& value);
/// Gives a field an error pair, or takes it away.
void set_error(std::string_view field, std::int32_t domain, std::int32_t code);
void clear_error(std::string_view field);

/// Sends a notification `count` times and returns how many observers took it; says on standard error when nobody
/// observes. An observer that was cut off because it did not read is a failure.
std::uint64_t notify_observers(const std::string& name, std::uint32_t count);

}  // namespace quorvel::tools
