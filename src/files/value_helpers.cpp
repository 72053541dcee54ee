#include "files/value_helpers.h"

#include <cstring>

#include "log/daemon_log.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"
#include "platform/process.h"

namespace quorvel {

PropertyValue make_mutable(PropertyValue value) noexcept {
  const bool copyable = value.is_dictionary() || value.kind() == PropertyKind::data;
  PropertyValue copy = copyable ? value.mutable_copy() : PropertyValue();
  if (copy) return copy;
  constexpr const char* kReason = "Could not create mutable copy! We are dead!";
  daemon_log(0, "make_mutable", "%s", kReason);
  platform::end_process(kReason, 255);
}

// A dictionary that two values refer to is copied before it changes, so a second reference is the snapshot: it needs no
// memory that could run out, and keeps every entry alive until the callback has seen it.
void dict_for_each(const PropertyValue& dictionary, DictionaryCallback callback, void* context) noexcept {
  const PropertyValue snapshot = dictionary;  // NOLINT(performance-unnecessary-copy-initialization): see above
  for (const auto& [key, value] : snapshot.entries()) callback(key, value, context);
}

void release_if_not_null(PropertyValue& value) noexcept { value = nullptr; }

const PropertyValue& as_string(const PropertyValue& value) noexcept {
  static constexpr detail::Word kNone = 0;
  return value.is_string() ? value : borrowed(kNone);
}

void mobile_home_path(char* buffer) noexcept {
  static_assert(sizeof paths::kMobileHome <= platform::kPathSize);
  std::memcpy(buffer, paths::kMobileHome, sizeof paths::kMobileHome);
}

}  // namespace quorvel
