// UTF-8 and big-endian UTF-16, checked and converted. Pure; any thread.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace quorvel {

enum class TextCheck { ascii, valid, invalid };

/// Whether a text is ASCII, other valid UTF-8 (no surrogates, nothing overlong, nothing above U+10FFFF), or neither.
[[nodiscard]] TextCheck check_utf8(std::string_view text) noexcept;
[[nodiscard]] bool is_ascii(std::string_view text) noexcept;

/// The length in bytes of the UTF-8 character that begins at `text[at]`, or 0 when none does.
[[nodiscard]] std::size_t utf8_character_length(std::string_view text, std::size_t at) noexcept;

/// True for a character of valid UTF-8 that must not reach a terminal as it is, since it could end, redraw, reorder or
/// hide a part of its line: C0 and C1 controls and DEL, line and paragraph separators, bidirectional controls,
/// characters without width, and tags.
[[nodiscard]] bool is_unsafe_to_display(std::string_view character) noexcept;

/// How many UTF-16 code units a valid UTF-8 text takes.
[[nodiscard]] std::size_t utf16_units(std::string_view utf8) noexcept;
/// Writes a valid UTF-8 text as big-endian UTF-16 and returns the end of what it wrote: two bytes a unit.
std::byte* write_utf16(std::string_view utf8, std::byte* out) noexcept;

/// How many bytes `units` big-endian UTF-16 code units take in UTF-8; SIZE_MAX when a surrogate stands alone.
[[nodiscard]] std::size_t utf8_length_of_utf16(const std::byte* utf16, std::size_t units) noexcept;
/// Writes valid big-endian UTF-16 as UTF-8 and returns the end of what it wrote.
char* write_utf8(const std::byte* utf16, std::size_t units, char* out) noexcept;

}  // namespace quorvel
