// Where the device-information service has its answers from. Each source answers a question or gives none.
#pragma once

#include <string_view>

#include "property/value.h"

namespace quorvel::platform::host {

/// The answers that packaging keeps in a file. Any thread.
[[nodiscard]] PropertyValue answer_from_file(std::string_view question) noexcept;

}  // namespace quorvel::platform::host
