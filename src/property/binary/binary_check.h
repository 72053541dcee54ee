#pragma once

#include <cstddef>
#include <span>

namespace quorvel::detail {

/// True when `bytes` are a binary property list with a dictionary on top that `read_binary` would read. False does not
/// say that it would not: that is left open for layouts which writers seldom choose (containers that stand before
/// their parents or are shared, keys out of order or not ASCII, objects out of order). Any thread.
[[nodiscard]] bool is_common_dictionary(std::span<const std::byte> bytes) noexcept;

}  // namespace quorvel::detail
