#include "property/unicode.h"

#include <cstring>

namespace quorvel {

namespace {

bool is_continuation(char byte) noexcept { return (static_cast<unsigned char>(byte) & 0xc0) == 0x80; }

std::uint32_t unit_at(const std::byte* utf16, std::size_t index) noexcept {
  return static_cast<std::uint32_t>(utf16[2 * index]) << 8 | static_cast<std::uint32_t>(utf16[2 * index + 1]);
}

bool is_high_surrogate(std::uint32_t unit) noexcept { return (unit & 0xfc00) == 0xd800; }
bool is_low_surrogate(std::uint32_t unit) noexcept { return (unit & 0xfc00) == 0xdc00; }

// The code point at `at`, which is moved behind it. The text is valid.
std::uint32_t next_code_point(std::string_view utf8, std::size_t& at) noexcept {
  const auto byte = [&](std::size_t offset) { return static_cast<unsigned char>(utf8[at + offset]); };
  const std::uint32_t first = byte(0);
  std::size_t length = 1;
  std::uint32_t point = first;
  if (first >= 0xf0) {
    length = 4;
    point = first & 0x07;
  } else if (first >= 0xe0) {
    length = 3;
    point = first & 0x0f;
  } else if (first >= 0xc0) {
    length = 2;
    point = first & 0x1f;
  }
  for (std::size_t i = 1; i < length; ++i) point = point << 6 | (byte(i) & 0x3f);
  at += length;
  return point;
}

struct CodePoints {
  std::uint32_t first, last;
};

// In ascending order.
constexpr CodePoints kUnsafeToDisplay[] = {
    {0x00, 0x1f},       {0x7f, 0x9f},        // C0, DEL and C1
    {0xad, 0xad},       {0x34f, 0x34f},      // soft hyphen, combining grapheme joiner
    {0x61c, 0x61c},                          // Arabic letter mark
    {0x115f, 0x1160},   {0x17b4, 0x17b5},    // fillers and inherent vowels, which show nothing
    {0x180b, 0x180f},                        // Mongolian selectors and separator
    {0x200b, 0x200f},   {0x2028, 0x202e},    // zero width, marks; separators, embeddings and overrides
    {0x2060, 0x206f},                        // word joiner, invisible operators, isolates
    {0x3164, 0x3164},                        // Hangul filler
    {0xfe00, 0xfe0e},   {0xfeff, 0xfeff},    // selectors but the one of emoji, byte order mark
    {0xffa0, 0xffa0},   {0xfff0, 0xfffb},    // half-width filler, interlinear annotation
    {0x1bca0, 0x1bca3}, {0x1d173, 0x1d17a},  // shorthand and musical format controls
    {0xe0000, 0xe0fff},                      // tags and further selectors
};

std::byte* put_unit(std::uint32_t unit, std::byte* out) noexcept {
  out[0] = static_cast<std::byte>(unit >> 8);
  out[1] = static_cast<std::byte>(unit);
  return out + 2;
}

}  // namespace

bool is_ascii(std::string_view text) noexcept {
  constexpr std::uint64_t kHighBits = 0x8080808080808080;
  std::uint64_t seen = 0, word = 0;
  std::size_t at = 0;
  for (; at + sizeof word <= text.size(); at += sizeof word) {
    std::memcpy(&word, text.data() + at, sizeof word);
    seen |= word;
  }
  for (; at < text.size(); ++at) seen |= static_cast<unsigned char>(text[at]);
  return (seen & kHighBits) == 0;
}

std::size_t utf8_character_length(std::string_view text, std::size_t at) noexcept {
  const auto byte = [&](std::size_t offset) { return static_cast<unsigned char>(text[at + offset]); };
  const std::size_t left = text.size() - at;
  const unsigned first = byte(0);
  if (first < 0x80) return 1;
  if (first < 0xc2 || first > 0xf4) return 0;
  if (left < 2 || !is_continuation(text[at + 1])) return 0;
  if (first < 0xe0) return 2;
  const unsigned second = byte(1);
  if (first == 0xe0 && second < 0xa0) return 0;
  if (first == 0xed && second > 0x9f) return 0;
  if (first == 0xf0 && second < 0x90) return 0;
  if (first == 0xf4 && second > 0x8f) return 0;
  if (left < 3 || !is_continuation(text[at + 2])) return 0;
  if (first < 0xf0) return 3;
  return left >= 4 && is_continuation(text[at + 3]) ? 4 : 0;
}

TextCheck check_utf8(std::string_view text) noexcept {
  if (is_ascii(text)) return TextCheck::ascii;
  for (std::size_t at = 0; at < text.size();) {
    const std::size_t length = utf8_character_length(text, at);
    if (length == 0) return TextCheck::invalid;
    at += length;
  }
  return TextCheck::valid;
}

bool is_unsafe_to_display(std::string_view character) noexcept {
  std::size_t at = 0;
  const std::uint32_t point = character.empty() ? ' ' : next_code_point(character, at);
  for (const CodePoints& range : kUnsafeToDisplay) {
    if (point <= range.last) return point >= range.first;
  }
  return false;
}

std::size_t utf16_units(std::string_view utf8) noexcept {
  std::size_t units = 0;
  for (const char byte : utf8) {
    if (!is_continuation(byte)) units += static_cast<unsigned char>(byte) >= 0xf0 ? 2 : 1;
  }
  return units;
}

std::byte* write_utf16(std::string_view utf8, std::byte* out) noexcept {
  for (std::size_t at = 0; at < utf8.size();) {
    const std::uint32_t point = next_code_point(utf8, at);
    if (point < 0x10000) {
      out = put_unit(point, out);
    } else {
      out = put_unit(0xd800 + ((point - 0x10000) >> 10), out);
      out = put_unit(0xdc00 + ((point - 0x10000) & 0x3ff), out);
    }
  }
  return out;
}

std::size_t utf8_length_of_utf16(const std::byte* utf16, std::size_t units) noexcept {
  std::size_t length = 0;
  for (std::size_t i = 0; i < units; ++i) {
    const std::uint32_t unit = unit_at(utf16, i);
    if (unit < 0x80) {
      length += 1;
    } else if (unit < 0x800) {
      length += 2;
    } else if (is_high_surrogate(unit)) {
      if (i + 1 == units || !is_low_surrogate(unit_at(utf16, i + 1))) return SIZE_MAX;
      ++i;
      length += 4;
    } else if (is_low_surrogate(unit)) {
      return SIZE_MAX;
    } else {
      length += 3;
    }
  }
  return length;
}

char* write_utf8(const std::byte* utf16, std::size_t units, char* out) noexcept {
  const auto put = [&out](std::uint32_t byte) { *out++ = static_cast<char>(byte); };
  for (std::size_t i = 0; i < units; ++i) {
    std::uint32_t point = unit_at(utf16, i);
    if (is_high_surrogate(point)) point = 0x10000 + ((point & 0x3ff) << 10) + (unit_at(utf16, ++i) & 0x3ff);
    if (point < 0x80) {
      put(point);
    } else if (point < 0x800) {
      put(0xc0 | point >> 6);
      put(0x80 | (point & 0x3f));
    } else if (point < 0x10000) {
      put(0xe0 | point >> 12);
      put(0x80 | (point >> 6 & 0x3f));
      put(0x80 | (point & 0x3f));
    } else {
      put(0xf0 | point >> 18);
      put(0x80 | (point >> 12 & 0x3f));
      put(0x80 | (point >> 6 & 0x3f));
      put(0x80 | (point & 0x3f));
    }
  }
  return out;
}

}  // namespace quorvel
