// Which questions the device-information service is asked for the keys that it answers.
#pragma once

#include "property/value.h"
#include "store/live_answer_table.h"

namespace quorvel {

/// The row that answers a domain and key, or null. A value that is no string counts as none. Any thread.
[[nodiscard]] const larry_info* find_live_answer(const PropertyValue& domain, const PropertyValue& key) noexcept;

/// Column 0: the question, column 1: its name, of the row that answers a domain and key. None when no row does, for
/// another column, and when memory runs out. Any thread.
[[nodiscard]] PropertyValue larry_lookup(const PropertyValue& domain, const PropertyValue& key, int column) noexcept;

}  // namespace quorvel
