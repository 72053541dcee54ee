// The hardware registry: entries named by paths such as "IODeviceTree:/baseband", each with named properties.
#pragma once

#include <string_view>

#include "platform/descriptor.h"
#include "property/value.h"

namespace quorvel::platform {

class RegistryEntry {
 public:
  /// The entry at `path`, empty when there is none. Any thread.
  [[nodiscard]] static RegistryEntry open(const char* path) noexcept;
  [[nodiscard]] explicit operator bool() const noexcept { return static_cast<bool>(directory_); }
  /// One property of the entry as a data value, cut where it is longer than 64 KiB; or none.
  [[nodiscard]] PropertyValue copy_property(std::string_view name) const noexcept;

 private:
  Descriptor directory_;
};

}  // namespace quorvel::platform
