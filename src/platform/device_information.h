#pragma once

#include <string_view>

#include "property/value.h"

namespace quorvel::platform {

/// The device-information service's answer to a question, or none when it has none. Asks anew each time. Any thread.
[[nodiscard]] PropertyValue copy_device_answer(std::string_view question) noexcept;

}  // namespace quorvel::platform
