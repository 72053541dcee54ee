// The device-information service: what the machine, its packaging and its telephony service know about the device.
#pragma once

#include <string_view>

#include "property/value.h"

namespace quorvel::platform {

struct DeviceAnswer {
  PropertyValue value;   ///< none when nobody knows
  PropertyValue origin;  ///< a text: the device path or the source that the value came from
};

/// The answer to a question with its origin, both none when nobody knows. Asks anew each time. Any thread.
[[nodiscard]] DeviceAnswer copy_device_answer_with_origin(std::string_view question) noexcept;

/// The answer alone.
[[nodiscard]] inline PropertyValue copy_device_answer(std::string_view question) noexcept {
  return copy_device_answer_with_origin(question).value;
}

}  // namespace quorvel::platform
