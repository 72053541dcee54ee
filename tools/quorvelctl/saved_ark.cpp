#include "saved_ark.h"

#include <algorithm>
#include <tuple>

#include "common/failure.h"
#include "files.h"
#include "platform/device_paths.h"

namespace quorvel::tools {

std::optional<PropertyValue> read_saved_ark() {
  constexpr const char* kConsequence =
      ": the daemon starts without its values, and sets it aside when it has others to save";
  std::optional<PropertyValue> ark = read_device_plist(paths::kDataFile, Links::refused, kConsequence);
  if (!ark || ark->is_dictionary()) return ark;
  throw Failure{kUnreachable, std::string(paths::kDataFile) + " is not a dictionary" + kConsequence};
}

std::vector<SavedEntry> saved_entries(const PropertyValue& ark) {
  std::vector<SavedEntry> entries;
  entries.reserve(ark.size());
  for (const auto [key, value] : ark.entries()) {
    const std::string_view name = key.text();
    const std::size_t hyphen = std::min(name.find('-'), name.size());
    entries.push_back(
        {std::string(name.substr(0, hyphen)), std::string(name.substr(std::min(hyphen + 1, name.size()))), value});
  }
  std::sort(entries.begin(), entries.end(), [](const SavedEntry& a, const SavedEntry& b) {
    return std::tie(a.domain, a.key) < std::tie(b.domain, b.key);
  });
  return entries;
}

}  // namespace quorvel::tools
