// The saved data ark, as the daemon would load it.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "property/value.h"

namespace quorvel::tools {

/// The saved dictionary, or nothing when no file is there: the daemon removes it when it has nothing to save. Throws
/// Failure for a file that the daemon would not take.
[[nodiscard]] std::optional<PropertyValue> read_saved_ark();

/// One entry, parted at the first "-" into its domain (empty: none) and its key. The file does not say where a domain
/// that has a "-" in itself ends.
struct SavedEntry {
  std::string domain;
  std::string key;
  PropertyValue value;
};

/// By domain and key, in ascending order.
[[nodiscard]] std::vector<SavedEntry> saved_entries(const PropertyValue& ark);

}  // namespace quorvel::tools
