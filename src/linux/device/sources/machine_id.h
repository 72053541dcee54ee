#pragma once

#include <array>
#include <cstddef>
#include <span>

namespace quorvel::platform::host {

using DeviceIdentifier = std::array<char, 32>;

/// The identifier, in hexadecimal, that a machine shows to one application instead of its machine-id. Pure.
[[nodiscard]] DeviceIdentifier derive_identifier(std::span<const std::byte, 16> machine,
                                                 std::span<const std::byte, 16> application) noexcept;

}  // namespace quorvel::platform::host
