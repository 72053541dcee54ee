// The grammars of small files: texts, numbers, addresses, assignments. Pure functions over hostile bytes.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string_view>

#include "property/byte_buffer.h"

namespace quorvel::platform::host {

/// The bytes up to the first NUL or newline without blanks around them; empty when they are no UTF-8 or hold a control
/// character. A view into `content`.
[[nodiscard]] std::string_view first_text(std::string_view content) noexcept;

/// True for the placeholders that makers of firmware leave in the place of a name or number.
[[nodiscard]] bool is_junk(std::string_view text) noexcept;

/// An optional sign and decimal digits that fit 64 bits, nothing else.
[[nodiscard]] std::optional<std::int64_t> parse_integer(std::string_view text) noexcept;
/// Decimal digits, or hexadecimal ones behind "0x", that fit 64 bits.
[[nodiscard]] std::optional<std::uint64_t> parse_chip_number(std::string_view text) noexcept;

/// The three digits with which a subscriber's identity begins, the country's; empty when it is none. A view into
/// `identity`.
[[nodiscard]] std::string_view country_code(std::string_view identity) noexcept;

/// True for the lower-case text of a unicast address other than all zeros.
[[nodiscard]] bool is_network_address(std::string_view text) noexcept;
inline constexpr std::size_t kAddressLength = 17;
/// The text of six bytes; the first byte given is the first one written.
void write_address(std::span<const std::byte, 6> bytes, char (&text)[kAddressLength]) noexcept;

/// Cuts the next text off a list in which each ends in NUL. Returns false behind the last one.
[[nodiscard]] bool take_listed_text(std::string_view& list, std::string_view& text) noexcept;

/// True when one of the lines is `line`.
[[nodiscard]] bool has_line(std::string_view content, std::string_view line) noexcept;

/// Puts the value that the last well-formed line NAME=value gives to `name` into `value`, its quotes and backslashes
/// resolved as os-release(5) has them. False when there is no such line and when memory runs out.
[[nodiscard]] bool find_assignment(std::string_view content, std::string_view name, ByteBuffer& value) noexcept;

/// True for 32 lower-case hexadecimal digits that are not all zeros, followed by at most a newline.
[[nodiscard]] bool parse_machine_id(std::string_view content, std::byte (&id)[16]) noexcept;

}  // namespace quorvel::platform::host
