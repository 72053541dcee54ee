// The results as a picture.
#pragma once

#include <iosfwd>

#include "bench/support/goals.h"

namespace quorvel::bench {

/// An SVG: a bar for every work, from the best peer's cost to ours, with the goal marked; and the curves of growth.
void draw(const Measurements& measurements, std::ostream& out);

}  // namespace quorvel::bench
