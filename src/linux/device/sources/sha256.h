// SHA-256 and the keyed hash over it, for identifiers that must not give away what they were made from. Pure.
#pragma once

#include <array>
#include <cstddef>
#include <span>

namespace quorvel::platform::host {

using Digest = std::array<std::byte, 32>;

/// The hash of two parts joined, which together are at most 119 bytes long.
[[nodiscard]] Digest sha256(std::span<const std::byte> head, std::span<const std::byte> tail) noexcept;

/// HMAC-SHA-256 of a short message under a key of at most 64 bytes.
[[nodiscard]] Digest hmac_sha256(std::span<const std::byte> key, std::span<const std::byte> message) noexcept;

}  // namespace quorvel::platform::host
