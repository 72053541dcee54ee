// The load generator.
#pragma once

#include <cstddef>

#include "bench/processes/service.h"

namespace quorvel::bench {

/// Calls for about `seconds`, over one connection after another reply or over several at once with one call under way
/// on each. Returns the nanoseconds from one reply to the next. Every reply must have the length and the end of the
/// first, and the last one on each connection must hold the data; throws otherwise.
[[nodiscard]] double call_one_by_one(const Service& service, const DataSet& data, double seconds);
[[nodiscard]] double call_at_once(const Service& service, const DataSet& data, std::size_t connections, double seconds);

}  // namespace quorvel::bench
