// What a failure frame carries: a dictionary with the two keys below.
#pragma once

#include "property/value.h"

namespace quorvel::wire {

inline constexpr StaticText kFailureCodeKey = "Code";                // integer
inline constexpr StaticText kFailureDescriptionKey = "Description";  // string

}  // namespace quorvel::wire
