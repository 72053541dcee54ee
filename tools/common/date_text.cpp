#include "date_text.h"

#include <charconv>
#include <chrono>
#include <cmath>
#include <cstdint>
#include <cstdio>

namespace quorvel::tools {
namespace {

using std::chrono::sys_seconds;
using namespace std::chrono_literals;

constexpr sys_seconds kEpoch = std::chrono::sys_days{2001y / 1 / 1};
constexpr sys_seconds kFirst = std::chrono::sys_days{1y / 1 / 1};
constexpr sys_seconds kPastLast = std::chrono::sys_days{std::chrono::year{10000} / 1 / 1};
constexpr std::string_view kPattern = "dddd-dd-ddTdd:dd:dd";

// What is missing from a decimal fraction to one: "25" becomes "75". The last digit is not zero.
std::string complement(std::string_view digits) {
  std::string result(digits);
  for (char& digit : result) digit = static_cast<char>('0' + '9' - digit);
  ++result.back();
  return result;
}

bool matches(std::string_view text, std::string_view pattern) {
  for (std::size_t i = 0; i < pattern.size(); ++i) {
    const bool digit = text[i] >= '0' && text[i] <= '9';
    if (pattern[i] == 'd' ? !digit : text[i] != pattern[i]) return false;
  }
  return true;
}

int number_at(std::string_view text, std::size_t position, std::size_t digits) {
  int number = 0;
  std::from_chars(text.data() + position, text.data() + position + digits, number);
  return number;
}

std::optional<sys_seconds> parse_whole_seconds(std::string_view text) {
  if (!matches(text, kPattern)) return std::nullopt;
  const std::chrono::year_month_day day{std::chrono::year{number_at(text, 0, 4)},
                                        std::chrono::month{static_cast<unsigned>(number_at(text, 5, 2))},
                                        std::chrono::day{static_cast<unsigned>(number_at(text, 8, 2))}};
  const int hour = number_at(text, 11, 2);
  const int minute = number_at(text, 14, 2);
  const int second = number_at(text, 17, 2);
  if (!day.ok() || day.year() < 1y || hour > 23 || minute > 59 || second > 59) return std::nullopt;
  return std::chrono::sys_days{day} + std::chrono::hours{hour} + std::chrono::minutes{minute} +
         std::chrono::seconds{second};
}

}  // namespace

std::optional<std::string> date_text(double seconds) {
  const double first = static_cast<double>((kFirst - kEpoch).count());
  const double past_last = static_cast<double>((kPastLast - kEpoch).count());
  if (!(seconds >= first && seconds < past_last) || (seconds == 0 && std::signbit(seconds))) return std::nullopt;
  // The shortest decimal number that is read back as this one; its fraction is then moved with decimal digits only.
  char decimal[400];
  const auto [end, failure] =
      std::to_chars(decimal, decimal + sizeof decimal, std::abs(seconds), std::chars_format::fixed);
  if (failure != std::errc{}) return std::nullopt;
  std::int64_t whole = 0;
  const char* point = std::from_chars(decimal, end, whole).ptr;
  std::string fraction(point == end ? point : point + 1, static_cast<const char*>(end));
  if (seconds < 0) {
    whole = fraction.empty() ? -whole : -whole - 1;
    if (!fraction.empty()) fraction = complement(fraction);
  }
  const sys_seconds time = kEpoch + std::chrono::seconds{whole};
  const auto day = std::chrono::floor<std::chrono::days>(time);
  const std::chrono::year_month_day date{day};
  const std::chrono::hh_mm_ss clock{time - day};
  char text[64];
  std::snprintf(text, sizeof text, "%04d-%02u-%02uT%02d:%02d:%02d", static_cast<int>(date.year()),
                static_cast<unsigned>(date.month()), static_cast<unsigned>(date.day()),
                static_cast<int>(clock.hours().count()), static_cast<int>(clock.minutes().count()),
                static_cast<int>(clock.seconds().count()));
  return text + (fraction.empty() ? "" : "." + fraction) + "Z";
}

std::optional<double> parse_date_text(std::string_view text) {
  if (text.size() <= kPattern.size() || text.back() != 'Z') return std::nullopt;
  std::string fraction(text.substr(kPattern.size(), text.size() - kPattern.size() - 1));
  if (!fraction.empty()) {
    if (fraction[0] != '.' || fraction.size() == 1 ||
        fraction.find_first_not_of("0123456789", 1) != std::string::npos) {
      return std::nullopt;
    }
    fraction.erase(0, 1);
    fraction.erase(fraction.find_last_not_of('0') + 1);
  }
  const std::optional<sys_seconds> time = parse_whole_seconds(text);
  if (!time) return std::nullopt;
  std::int64_t whole = (*time - kEpoch).count();
  const bool negative = whole < 0;
  if (negative) {
    whole = fraction.empty() ? -whole : -whole - 1;
    if (!fraction.empty()) fraction = complement(fraction);
  }
  const std::string decimal = std::to_string(whole) + "." + (fraction.empty() ? "0" : fraction);
  double seconds = 0;
  const auto [end, failure] = std::from_chars(decimal.data(), decimal.data() + decimal.size(), seconds);
  if (failure == std::errc::invalid_argument) return std::nullopt;
  return negative ? -seconds : seconds;
}

}  // namespace quorvel::tools
