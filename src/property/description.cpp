#include "property/description.h"

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <limits>

#include "property/limits.h"
#include "property/unicode.h"

namespace quorvel {

namespace {

constexpr std::string_view kDigits = "0123456789abcdef";
constexpr std::size_t kDescribedBytes = 16;
// Seconds from 0000-01-01 and to 9999-12-31T23:59:59, counted from 2001: the years that four digits name.
constexpr double kFirstDate = -63'145'526'400.0;
constexpr double kLastDate = 252'423'993'600.0;
constexpr double kSecondsADay = 86'400.0;

void put_byte(unsigned byte, TextSink& sink) noexcept {
  const char digits[] = {kDigits[byte >> 4 & 15], kDigits[byte & 15]};
  sink.put(std::string_view(digits, sizeof digits));
}

void put_escape(std::string_view bytes, TextSink& sink) noexcept {
  if (bytes == "\n") return sink.put("\\n");
  if (bytes == "\t") return sink.put("\\t");
  if (bytes == "\r") return sink.put("\\r");
  for (const char byte : bytes) {
    sink.put("\\x");
    put_byte(static_cast<unsigned char>(byte), sink);
  }
}

bool is_plain(char byte) noexcept { return byte >= 0x20 && byte < 0x7f; }

// With fifteen digits, or as many more as tell the number from its neighbours. std::to_chars brings 150 KiB of code
// and tables into the daemon, for something that is seldom seen.
void describe_real(double number, TextSink& sink) noexcept {
  if (std::isnan(number)) return sink.put("nan");
  char text[32];
  int length = 0, precision = std::numeric_limits<double>::digits10;
  do {
    length = std::snprintf(text, sizeof text, "%.*g", precision, number);
  } while (std::strtod(text, nullptr) != number && ++precision <= std::numeric_limits<double>::max_digits10);
  const std::string_view digits(text, static_cast<std::size_t>(length));
  sink.put(digits);
  if (digits.find_first_of(".einf") == std::string_view::npos) sink.put(".0");
}

void put_padded(std::uint64_t number, int width, TextSink& sink) noexcept {
  char text[24];
  char* at = text + sizeof text;
  for (; width > 0 || number > 0; --width, number /= 10) *--at = static_cast<char>('0' + number % 10);
  sink.put(std::string_view(at, static_cast<std::size_t>(text + sizeof text - at)));
}

// Days since 0000-03-01 to year, month and day.
void put_calendar_day(std::int64_t days, TextSink& sink) noexcept {
  const std::int64_t era = (days >= 0 ? days : days - 146'096) / 146'097;
  const std::int64_t day_of_era = days - era * 146'097;
  const std::int64_t year_of_era = (day_of_era - day_of_era / 1'460 + day_of_era / 36'524 - day_of_era / 146'096) / 365;
  const std::int64_t day_of_year = day_of_era - (365 * year_of_era + year_of_era / 4 - year_of_era / 100);
  const std::int64_t month_from_march = (5 * day_of_year + 2) / 153;
  const std::int64_t month = month_from_march + (month_from_march < 10 ? 3 : -9);
  const std::int64_t year = year_of_era + era * 400 + (month <= 2 ? 1 : 0);
  put_padded(static_cast<std::uint64_t>(year), 4, sink);
  sink.put('-');
  put_padded(static_cast<std::uint64_t>(month), 2, sink);
  sink.put('-');
  put_padded(static_cast<std::uint64_t>(day_of_year - (153 * month_from_march + 2) / 5 + 1), 2, sink);
}

void describe_date(double seconds, TextSink& sink) noexcept {
  if (!(seconds >= kFirstDate && seconds < kLastDate)) {
    sink.put("date ");
    describe_real(seconds, sink);
    return;
  }
  constexpr std::int64_t kDaysTo2001 = 730'791;  // from 0000-03-01
  const double day = std::floor(seconds / kSecondsADay);
  const double in_day = seconds - day * kSecondsADay;
  const auto whole = static_cast<std::uint64_t>(in_day);
  put_calendar_day(static_cast<std::int64_t>(day) + kDaysTo2001, sink);
  sink.put('T');
  put_padded(whole / 3'600, 2, sink);
  sink.put(':');
  put_padded(whole / 60 % 60, 2, sink);
  sink.put(':');
  put_padded(whole % 60, 2, sink);
  const auto milliseconds = static_cast<std::uint64_t>((in_day - static_cast<double>(whole)) * 1'000);
  if (milliseconds > 0) {
    sink.put('.');
    put_padded(milliseconds, 3, sink);
  }
  sink.put('Z');
}

void describe_data(std::span<const std::byte> bytes, TextSink& sink) noexcept {
  sink.put('<');
  const std::size_t shown = std::min(bytes.size(), kDescribedBytes);
  for (std::size_t i = 0; i < shown; ++i) {
    if (i > 0 && i % 4 == 0) sink.put(' ');
    put_byte(static_cast<unsigned>(bytes[i]), sink);
  }
  if (shown > 0) sink.put(shown < bytes.size() ? " … " : " ");
  sink.put_decimal(static_cast<std::uint64_t>(bytes.size()));
  sink.put(bytes.size() == 1 ? " byte>" : " bytes>");
}

void describe_element(const PropertyValue& value, std::size_t depth, TextSink& sink) noexcept;

void describe_container(const PropertyValue& value, std::size_t depth, TextSink& sink) noexcept {
  const bool is_dictionary = value.is_dictionary();
  sink.put(is_dictionary ? '{' : '[');
  if (depth > kMaximumDepth) {
    sink.put("…");
  } else if (is_dictionary) {
    bool first = true;
    for (const auto& [key, element] : value.entries()) {
      if (sink.full()) return;
      if (!std::exchange(first, false)) sink.put(", ");
      describe_element(key, depth, sink);
      sink.put(": ");
      describe_element(element, depth, sink);
    }
  } else {
    for (std::size_t i = 0; i < value.size() && !sink.full(); ++i) {
      if (i > 0) sink.put(", ");
      describe_element(value.at(i), depth, sink);
    }
  }
  sink.put(is_dictionary ? '}' : ']');
}

void describe_element(const PropertyValue& value, std::size_t depth, TextSink& sink) noexcept {
  if (value.is_container()) return describe_container(value, depth + 1, sink);
  if (!value.is_string()) return describe(value, sink);
  sink.put('"');
  std::string_view rest = value.text();
  for (std::size_t quote; (quote = rest.find('"')) != std::string_view::npos && !sink.full();) {
    sink.put_escaped(rest.substr(0, quote));
    sink.put("\\\"");
    rest.remove_prefix(quote + 1);
  }
  sink.put_escaped(rest);
  sink.put('"');
}

}  // namespace

void TextSink::put(std::string_view text) noexcept {
  if (full_) return;
  const auto room = static_cast<std::size_t>(end_ - at_);
  std::size_t count = std::min(room, text.size());
  if (count < text.size()) {
    // A cut falls between characters.
    while (count > 0 && (static_cast<unsigned char>(text[count]) & 0xc0) == 0x80) --count;
  }
  if (count > 0) std::memcpy(at_, text.data(), count);
  at_ += count;
  full_ = count < text.size();
}

void TextSink::put_decimal(std::uint64_t number) noexcept {
  char text[24];
  put(std::string_view(text, static_cast<std::size_t>(std::to_chars(text, text + sizeof text, number).ptr - text)));
}

void TextSink::put_decimal(std::int64_t number) noexcept {
  if (number < 0) put('-');
  put_decimal(number < 0 ? 0 - static_cast<std::uint64_t>(number) : static_cast<std::uint64_t>(number));
}

void TextSink::put_escaped(std::string_view text) noexcept {
  for (std::size_t at = 0; at < text.size() && !full_;) {
    std::size_t plain = at;
    while (plain < text.size() && is_plain(text[plain])) ++plain;
    put({text.data() + at, plain - at});
    at = plain;
    if (at == text.size()) return;
    const std::size_t length = utf8_character_length(text, at);
    const std::string_view character(text.data() + at, std::max<std::size_t>(length, 1));
    if (length == 0 || is_unsafe_to_display(character)) {
      put_escape(character, *this);
    } else {
      put(character);
    }
    at += character.size();
  }
}

void describe(const PropertyValue& value, TextSink& sink) noexcept {
  switch (value.kind()) {
    case PropertyKind::none: return sink.put("(null)");
    case PropertyKind::boolean: return sink.put(value.to_boolean() ? "true" : "false");
    case PropertyKind::integer:
      if (const auto number = value.to_int64()) return sink.put_decimal(*number);
      return sink.put_decimal(*value.to_uint64());
    case PropertyKind::real: return describe_real(value.to_double(), sink);
    case PropertyKind::date: return describe_date(value.to_double(), sink);
    case PropertyKind::string: return sink.put_escaped(value.text());
    case PropertyKind::data: return describe_data(value.bytes(), sink);
    case PropertyKind::array:
    case PropertyKind::dictionary: return describe_container(value, 1, sink);
  }
}

}  // namespace quorvel
