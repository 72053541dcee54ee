// Base64 with the standard alphabet and padding.
#pragma once

#include <cstddef>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace quorvel::tools {

[[nodiscard]] std::string encode_base64(std::span<const std::byte> bytes);

/// The bytes that `text` stands for; nothing when it is not base64 to the letter: four characters a group, padded, no
/// blanks, and no bits set that belong to no byte.
[[nodiscard]] std::optional<std::vector<std::byte>> decode_base64(std::string_view text);

}  // namespace quorvel::tools
