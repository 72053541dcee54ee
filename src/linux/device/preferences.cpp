#include "platform/preferences.h"

#include <cstdio>

#include "linux/base/small_file.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"

namespace quorvel::platform {

PropertyValue copy_preference(std::string_view key, std::string_view domain) noexcept {
  if (domain.empty() || domain.find_first_of(std::string_view("/\0", 2)) != std::string_view::npos) return nullptr;
  if (domain.size() >= kPathSize) return nullptr;
  char path[kPathSize];
  const int length = std::snprintf(path, sizeof path, "%s/%.*s.plist", paths::kPreferencesDirectory,
                                   static_cast<int>(domain.size()), domain.data());
  if (length < 0 || static_cast<std::size_t>(length) >= sizeof path) return nullptr;
  // The daemon asks for one domain.
  static constinit std::atomic<bool> told = false;
  return host::read_file_entry(path, key, told);
}

bool has_integer_preference(std::string_view key, std::string_view domain) noexcept {
  return copy_preference(key, domain).kind() == PropertyKind::integer;
}

}  // namespace quorvel::platform
