// Markers and widths of the binary property list, shared by its reader and writer. docs/property-list.md describes it.
//
//   "bplist00"  objects  offset table  trailer
//
// All integers are big-endian. An object is a marker (kind in the high four bits, size in the low four) and its body.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>

namespace quorvel::binary_format {

inline constexpr std::string_view kHeader = "bplist00";
inline constexpr std::size_t kTrailerSize = 32;
/// Header, one object, one offset and the trailer: nothing shorter holds a value.
inline constexpr std::size_t kSmallestFile = kHeader.size() + 1 + 1 + kTrailerSize;

// Where the trailer's fields lie in it.
inline constexpr std::size_t kOffsetSizeAt = 6;
inline constexpr std::size_t kReferenceSizeAt = 7;
inline constexpr std::size_t kObjectCountAt = 8;
inline constexpr std::size_t kTopObjectAt = 16;
inline constexpr std::size_t kTableOffsetAt = 24;

inline constexpr std::uint8_t kFalse = 0x08;
inline constexpr std::uint8_t kTrue = 0x09;
inline constexpr std::uint8_t kDate = 0x33;
// The high four bits of the other kinds.
inline constexpr std::uint8_t kInteger = 0x1;     // 2^n bytes: 1, 2, 4 unsigned; 8 signed; 16 two's complement
inline constexpr std::uint8_t kReal = 0x2;        // 2^n bytes: 4 or 8
inline constexpr std::uint8_t kData = 0x4;        // n bytes
inline constexpr std::uint8_t kAsciiText = 0x5;   // n bytes
inline constexpr std::uint8_t kUtf16Text = 0x6;   // n code units
inline constexpr std::uint8_t kArray = 0xA;       // n references
inline constexpr std::uint8_t kDictionary = 0xD;  // n key references, then n value references
/// A size of this or more stands in an integer object behind the marker.
inline constexpr std::uint8_t kLongSize = 0xF;

namespace detail {
template <class T>
[[nodiscard]] inline std::uint64_t load_big_endian(const std::byte* from) noexcept {
  T value;
  std::memcpy(&value, from, sizeof value);
  if constexpr (std::endian::native == std::endian::big) return value;
  if constexpr (sizeof value == 2) return __builtin_bswap16(value);
  if constexpr (sizeof value == 4) return __builtin_bswap32(value);
  return __builtin_bswap64(value);
}
template <class T>
inline void store_big_endian(std::byte* to, std::uint64_t value) noexcept {
  auto stored = static_cast<T>(value);
  if constexpr (std::endian::native == std::endian::little) {
    if constexpr (sizeof stored == 2) stored = __builtin_bswap16(stored);
    if constexpr (sizeof stored == 4) stored = __builtin_bswap32(stored);
    if constexpr (sizeof stored == 8) stored = __builtin_bswap64(stored);
  }
  std::memcpy(to, &stored, sizeof stored);
}
}  // namespace detail

/// Unsigned big-endian integers of 1 to 8 bytes.
[[nodiscard]] inline std::uint64_t get_integer(const std::byte* from, std::size_t width) noexcept {
  switch (width) {
    case 1: return static_cast<std::uint64_t>(*from);
    case 2: return detail::load_big_endian<std::uint16_t>(from);
    case 4: return detail::load_big_endian<std::uint32_t>(from);
    case 8: return detail::load_big_endian<std::uint64_t>(from);
    default: break;
  }
  std::uint64_t value = 0;
  for (std::size_t i = 0; i < width; ++i) value = value << 8 | static_cast<std::uint64_t>(from[i]);
  return value;
}
/// 1, 2, 4 or 8 bytes.
inline void put_integer(std::byte* to, std::uint64_t value, std::size_t width) noexcept {
  switch (width) {
    case 1: *to = static_cast<std::byte>(value); break;
    case 2: detail::store_big_endian<std::uint16_t>(to, value); break;
    case 4: detail::store_big_endian<std::uint32_t>(to, value); break;
    default: detail::store_big_endian<std::uint64_t>(to, value); break;
  }
}
/// The fewest bytes that hold `value`, of the widths that every reader knows.
[[nodiscard]] constexpr std::size_t integer_width(std::uint64_t value) noexcept {
  return value <= 0xff ? 1 : value <= 0xffff ? 2 : value <= 0xffff'ffff ? 4 : 8;
}

}  // namespace quorvel::binary_format
