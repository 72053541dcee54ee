// What a failure frame carries: a dictionary with the two keys below.
#pragma once

#include <cstdint>

#include "property/value.h"

namespace quorvel::wire {

inline constexpr StaticText kFailureCodeKey = "Code";                // integer
inline constexpr StaticText kFailureDescriptionKey = "Description";  // string

/// Failures that the service reports before an operation runs: there is none of that name, or it cannot take the
/// argument.
inline constexpr std::int32_t kUnknownOperation = 1;
inline constexpr std::int32_t kRefusedArgument = 2;

}  // namespace quorvel::wire
