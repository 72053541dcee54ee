// The data as the daemon's own values.
#pragma once

#include "bench/data_set.h"
#include "property/value.h"

namespace quorvel::bench {

[[nodiscard]] PropertyValue to_property(const Value& value);
/// Throws for a value of a kind that the data does not have.
[[nodiscard]] Value from_property(const PropertyValue& value);
/// Store key to value, as the data ark's file holds it.
[[nodiscard]] PropertyValue to_property(const DataSet& data);
[[nodiscard]] bool matches(const PropertyValue& dictionary, const DataSet& data);

}  // namespace quorvel::bench
