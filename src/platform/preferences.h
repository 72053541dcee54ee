// The preferences store, for the current user and host. Any thread.
#pragma once

#include <string_view>

#include "property/value.h"

namespace quorvel::platform {

/// The value of `key` in `domain`, of any kind, or none.
[[nodiscard]] PropertyValue copy_preference(std::string_view key, std::string_view domain) noexcept;

/// True when `key` exists in `domain` with an integer value.
[[nodiscard]] bool has_integer_preference(std::string_view key, std::string_view domain) noexcept;

}  // namespace quorvel::platform
