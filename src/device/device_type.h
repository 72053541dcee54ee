// What kind of device this is: detected once, at the first question, and fixed for the life of the process. Any thread
// may call everything here; whoever asks during the detection waits for its end.
#pragma once

#include <cstdint>

#include "property/value.h"

namespace quorvel {

struct DeviceTypeInfo {
  PropertyValue product_type;  ///< a string such as "Ondrel5,1", or none
  bool has_telephony = false;
  std::int32_t baseband_class = -1;  ///< -1 when the device does not tell
  bool machine_override = false;     ///< fixed values stand in for what the device tells
};

/// The record, borrowed. The first call detects the device type and logs what it found.
[[nodiscard]] const DeviceTypeInfo& get_device_type_internal() noexcept;

/// True when the baseband class is above 1.
[[nodiscard]] bool has_new_baseband() noexcept;

/// The property `name`, a string, of the hardware registry's entry at `path`: four bytes in native order. -1 after
/// logging why when there is no such entry, property or value.
[[nodiscard]] std::int32_t getDeviceTreeInt(const char* path, const PropertyValue& name) noexcept;

}  // namespace quorvel
