#include "linux/device/sources/parsing.h"

#include <algorithm>
#include <charconv>

#include "property/unicode.h"

namespace quorvel::platform::host {

namespace {

constexpr std::size_t kNowhere = std::string_view::npos;
constexpr char kDigits[] = "0123456789abcdef";

// Sorted, in lower case.
constexpr std::string_view kJunk[] = {
    "0123456789",
    "123456789",
    "1234567890",
    "base board serial number",
    "board manufacturer",
    "board name",
    "board product name",
    "board serial number",
    "board vendor name",
    "chassis serial number",
    "default",
    "default string",
    "empty",
    "invalid",
    "n/a",
    "na",
    "no enclosure",
    "none",
    "not applicable",
    "not available",
    "not defined",
    "not present",
    "not provided",
    "not settable",
    "not specified",
    "null",
    "o.e.m.",
    "oem",
    "product name",
    "serial number",
    "sku",
    "sku number",
    "system family",
    "system manufacturer",
    "system name",
    "system product name",
    "system serial number",
    "system sku",
    "system skunumber",
    "system vendor",
    "system version",
    "tbd by oem",
    "to be filled by o.e.m",
    "to be filled by o.e.m.",
    "to be filled by oem",
    "to be filled in by o.e.m.",
    "type1productconfigid",
    "undefined",
    "unknow",
    "unknown",
    "unknown product",
};

static_assert(std::ranges::is_sorted(kJunk));

[[nodiscard]] char lower(char c) noexcept { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; }

[[nodiscard]] bool equal_to_lower(std::string_view text, std::string_view lower_case) noexcept {
  return std::ranges::equal(text, lower_case, {}, lower);
}

[[nodiscard]] std::string_view trimmed(std::string_view text) noexcept {
  const std::size_t start = text.find_first_not_of(" \t\r");
  if (start == kNowhere) return {};
  return text.substr(start, text.find_last_not_of(" \t\r") - start + 1);
}

// Control characters of both sets: those of ASCII, and U+0080 to U+009F.
[[nodiscard]] bool has_control(std::string_view text) noexcept {
  for (std::size_t i = 0; i < text.size(); ++i) {
    const auto byte = static_cast<unsigned char>(text[i]);
    if (byte < 0x20 || byte == 0x7f) return true;
    if (byte == 0xc2 && i + 1 < text.size() && static_cast<unsigned char>(text[i + 1]) < 0xa0) return true;
  }
  return false;
}

[[nodiscard]] std::optional<unsigned> hexadecimal(char digit) noexcept {
  const auto* const end = kDigits + 16;
  const auto* const at = std::find(kDigits, end, digit);
  if (at == end) return std::nullopt;
  return static_cast<unsigned>(at - kDigits);
}

template <typename Number>
[[nodiscard]] std::optional<Number> whole_number(std::string_view digits, int base) noexcept {
  Number number{};
  const char* const end = digits.data() + digits.size();
  const auto [at, error] = std::from_chars(digits.data(), end, number, base);
  if (digits.empty() || error != std::errc() || at != end) return std::nullopt;
  return number;
}

// Resolves the value of one line into `out`; false when the line is malformed.
[[nodiscard]] bool unquote(std::string_view value, ByteBuffer& out) noexcept {
  out.clear();
  const char quote = !value.empty() && (value[0] == '"' || value[0] == '\'') ? value[0] : '\0';
  for (std::size_t i = quote == '\0' ? 0 : 1; i < value.size(); ++i) {
    char c = value[i];
    if (quote != '\0' && c == quote) return trimmed(value.substr(i + 1)).empty();
    if (quote == '\0' && (c == '"' || c == '\'')) return false;
    if (c == '\\' && quote != '\'') {
      if (i + 1 == value.size()) return false;
      const bool escapes = quote == '\0' || std::string_view("\"\\$`").find(value[i + 1]) != kNowhere;
      if (escapes) c = value[++i];
    }
    if (!out.append(&c, 1)) return false;
  }
  return quote == '\0';
}

}  // namespace

std::string_view first_text(std::string_view content) noexcept {
  const std::string_view text = trimmed(content.substr(0, content.find_first_of(std::string_view("\0\n", 2))));
  return has_control(text) || check_utf8(text) == TextCheck::invalid ? std::string_view{} : text;
}

bool is_junk(std::string_view text) noexcept {
  if (text.find_first_not_of(text.substr(0, 1)) == kNowhere) return true;  // one character repeated, or empty
  const auto same_but_case = [text](std::string_view junk) { return equal_to_lower(text, junk); };
  if (std::ranges::any_of(kJunk, same_but_case)) return true;
  return std::ranges::all_of(text, [first = lower(text[0])](char c) { return lower(c) == first; });
}

std::optional<std::int64_t> parse_integer(std::string_view text) noexcept {
  if (text.starts_with('+')) {
    text.remove_prefix(1);
    if (text.starts_with('-')) return std::nullopt;
  }
  return whole_number<std::int64_t>(text, 10);
}

std::optional<std::uint64_t> parse_chip_number(std::string_view text) noexcept {
  if (text.starts_with("0x") || text.starts_with("0X")) return whole_number<std::uint64_t>(text.substr(2), 16);
  return whole_number<std::uint64_t>(text, 10);
}

std::string_view country_code(std::string_view identity) noexcept {
  // The network's two or three digits and at least one of the subscriber's follow.
  const bool is_identity = identity.size() >= 6 && identity.size() <= 15;
  return is_identity && identity.find_first_not_of("0123456789") == kNowhere ? identity.substr(0, 3)
                                                                             : std::string_view{};
}

bool is_network_address(std::string_view text) noexcept {
  if (text.size() != kAddressLength) return false;
  bool is_zero = true;
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (i % 3 == 2 ? text[i] != ':' : !hexadecimal(text[i])) return false;
    is_zero &= text[i] == '0' || text[i] == ':';
  }
  // The lowest bit of the first byte marks an address of many, all ones included.
  return !is_zero && *hexadecimal(text[1]) % 2 == 0;
}

void write_address(std::span<const std::byte, 6> bytes, char (&text)[kAddressLength]) noexcept {
  std::ranges::fill(text, ':');
  for (std::size_t i = 0; i < bytes.size(); ++i) {
    text[3 * i] = kDigits[std::to_integer<unsigned>(bytes[i]) >> 4];
    text[3 * i + 1] = kDigits[std::to_integer<unsigned>(bytes[i]) & 15];
  }
}

bool take_listed_text(std::string_view& list, std::string_view& text) noexcept {
  if (list.empty()) return false;
  const std::size_t length = std::min(list.find('\0'), list.size());
  text = list.substr(0, length);
  list.remove_prefix(std::min(length + 1, list.size()));
  return true;
}

bool has_line(std::string_view content, std::string_view line) noexcept {
  while (!content.empty()) {
    const std::size_t length = std::min(content.find('\n'), content.size());
    if (content.substr(0, length) == line) return true;
    content.remove_prefix(std::min(length + 1, content.size()));
  }
  return false;
}

bool find_assignment(std::string_view content, std::string_view name, ByteBuffer& value) noexcept {
  bool found = false;
  ByteBuffer candidate;
  while (!content.empty()) {
    const std::size_t length = std::min(content.find('\n'), content.size());
    std::string_view line = content.substr(0, length);
    content.remove_prefix(std::min(length + 1, content.size()));
    if (!line.starts_with(name) || line.size() == name.size() || line[name.size()] != '=') continue;
    if (!unquote(trimmed(line.substr(name.size() + 1)), candidate)) continue;
    value = std::move(candidate);
    candidate = {};
    found = true;
  }
  return found;
}

bool parse_machine_id(std::string_view content, std::byte (&id)[16]) noexcept {
  if (content.ends_with('\n')) content.remove_suffix(1);
  if (content.size() != 32 || content.find_first_not_of('0') == kNowhere) return false;
  for (std::size_t i = 0; i < 16; ++i) {
    const auto high = hexadecimal(content[2 * i]);
    const auto low = hexadecimal(content[2 * i + 1]);
    if (!high || !low) return false;
    id[i] = static_cast<std::byte>(*high << 4 | *low);
  }
  return true;
}

}  // namespace quorvel::platform::host
