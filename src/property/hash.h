// The hash of keys, under a seed of this process, so that no file can aim its keys at one slot.
#pragma once

#include <concepts>
#include <cstdint>
#include <cstring>
#include <string_view>

namespace quorvel {

static_assert(sizeof(void*) == 8, "quorveld is for 64-bit processors");

namespace detail {

__extension__ using Product = unsigned __int128;

extern const std::uint64_t kHashSeed;

[[nodiscard]] inline std::uint64_t mix(std::uint64_t left, std::uint64_t right) noexcept {
  const Product product = static_cast<Product>(left) * right;
  return static_cast<std::uint64_t>(product) ^ static_cast<std::uint64_t>(product >> 64);
}

template <class T>
[[nodiscard]] inline std::uint64_t load_as(const char* from) noexcept {
  T value;
  std::memcpy(&value, from, sizeof value);
  return value;
}

[[nodiscard]] inline std::uint32_t hash_text(std::string_view text) noexcept {
  constexpr std::uint64_t kFirst = 0x9e3779b97f4a7c15, kSecond = 0xd1b54a32d192ed03;
  const char* at = text.data();
  std::size_t left = text.size();
  std::uint64_t state = kHashSeed ^ left;
  for (; left > 16; at += 16, left -= 16) {
    state = mix(load_as<std::uint64_t>(at) ^ kFirst, load_as<std::uint64_t>(at + 8) ^ state);
  }
  std::uint64_t low = 0, high = 0;
  if (left >= 8) {
    low = load_as<std::uint64_t>(at);
    high = load_as<std::uint64_t>(at + left - 8);
  } else if (left >= 4) {
    low = load_as<std::uint32_t>(at);
    high = load_as<std::uint32_t>(at + left - 4);
  } else if (left > 0) {
    low = load_as<std::uint8_t>(at) << 16 | load_as<std::uint8_t>(at + left / 2) << 8 |
          load_as<std::uint8_t>(at + left - 1);
  }
  const std::uint64_t hash = mix(low ^ kFirst, high ^ state ^ kSecond);
  return static_cast<std::uint32_t>(hash ^ (hash >> 32));
}

}  // namespace detail

/// A text together with its hash, so that a caller can hash once, and before it takes a lock.
struct HashedKey {
  template <std::convertible_to<std::string_view> Text>
  HashedKey(const Text& key) noexcept : text(key), hash(detail::hash_text(text)) {}
  std::string_view text;
  std::uint32_t hash;
};

}  // namespace quorvel
