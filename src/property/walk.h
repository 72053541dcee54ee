// Tells whether walking over a value stays within the limits that hold for every operation: see limits.h.
#pragma once

#include <cstddef>

#include "property/limits.h"
#include "property/value.h"

namespace quorvel {

/// True when a walk over `value` stays within the limits, with `containers_around` containers around it. False also
/// when memory runs out. The time it takes grows with what the value holds, not with how often that is repeated. Any
/// thread.
[[nodiscard]] bool is_within_limits(const PropertyValue& value, std::size_t containers_around = 0) noexcept;

}  // namespace quorvel
