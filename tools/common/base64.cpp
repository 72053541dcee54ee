#include "base64.h"

#include <cstdint>

namespace quorvel::tools {
namespace {

constexpr std::string_view kAlphabet = "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

}  // namespace

std::string encode_base64(std::span<const std::byte> bytes) {
  std::string text;
  text.reserve((bytes.size() + 2) / 3 * 4);
  for (std::size_t i = 0; i < bytes.size(); i += 3) {
    const std::size_t count = std::min<std::size_t>(3, bytes.size() - i);
    std::uint32_t group = 0;
    for (std::size_t k = 0; k < 3; ++k)
      group = group << 8 | (k < count ? std::to_integer<std::uint32_t>(bytes[i + k]) : 0);
    for (std::size_t k = 0; k < 4; ++k) text += k <= count ? kAlphabet[group >> (18 - 6 * k) & 63] : '=';
  }
  return text;
}

std::optional<std::vector<std::byte>> decode_base64(std::string_view text) {
  if (text.size() % 4 != 0) return std::nullopt;
  const std::size_t padding = text.ends_with("==") ? 2 : text.ends_with('=') ? 1 : 0;
  std::vector<std::byte> bytes;
  bytes.reserve(text.size() / 4 * 3);
  for (std::size_t i = 0; i < text.size(); i += 4) {
    const std::size_t used = i + 4 == text.size() ? 4 - padding : 4;
    std::uint32_t group = 0;
    for (std::size_t k = 0; k < 4; ++k) {
      const std::size_t digit = k < used ? kAlphabet.find(text[i + k]) : 0;
      if (digit == std::string_view::npos) return std::nullopt;
      group = group << 6 | static_cast<std::uint32_t>(digit);
    }
    const std::uint32_t surplus = used == 4 ? 0 : used == 3 ? 0xff : 0xffff;
    if ((group & surplus) != 0) return std::nullopt;
    for (std::size_t k = 0; k + 1 < used; ++k) bytes.push_back(static_cast<std::byte>(group >> (16 - 8 * k)));
  }
  return bytes;
}

}  // namespace quorvel::tools
