#include "log/message.h"

#include <algorithm>
#include <cstring>

namespace quorvel {

namespace {

using detail::Conversion;
using Type = LogArgument::Type;

constexpr std::size_t kNumberRoom = 32;

std::string_view print_number(std::uint64_t magnitude, bool negative, unsigned base, const char* digits,
                              char (&room)[kNumberRoom]) noexcept {
  char* at = room + kNumberRoom;
  do {
    *--at = digits[magnitude % base];
    magnitude /= base;
  } while (magnitude > 0);
  if (negative) *--at = '-';
  return {at, static_cast<std::size_t>(room + kNumberRoom - at)};
}

std::string_view format_number(const Conversion& conversion, const LogArgument& argument,
                               char (&room)[kNumberRoom]) noexcept {
  constexpr const char* kLower = "0123456789abcdef";
  const bool is_signed = argument.type == Type::int_ || argument.type == Type::long_;
  if (is_signed) {
    const auto bits = static_cast<std::uint64_t>(argument.number);
    return print_number(argument.number < 0 ? 0 - bits : bits, argument.number < 0, 10, kLower, room);
  }
  const unsigned base = conversion.letter == 'u' ? 10 : conversion.letter == 'o' ? 8 : 16;
  return print_number(argument.unsigned_number, false, base, conversion.letter == 'X' ? "0123456789ABCDEF" : kLower,
                      room);
}

std::string_view format_pointer(const void* pointer, char (&room)[kNumberRoom]) noexcept {
  const std::string_view digits =
      print_number(reinterpret_cast<std::uintptr_t>(pointer), false, 16, "0123456789abcdef", room);
  char* at = room + (kNumberRoom - digits.size() - 2);
  at[0] = '0';
  at[1] = 'x';
  return {at, digits.size() + 2};
}

void pad(char fill, std::size_t count, TextSink& sink) noexcept {
  for (; count > 0 && !sink.full(); --count) sink.put(fill);
}

void put_field(const Conversion& conversion, std::string_view text, bool escaped, TextSink& sink) noexcept {
  const auto width = static_cast<std::size_t>(conversion.width);
  const std::size_t padding = width > text.size() ? width - text.size() : 0;
  const bool zeros = conversion.zero && !conversion.left && !escaped;
  if (zeros && padding > 0 && text.starts_with('-')) {
    sink.put('-');
    text.remove_prefix(1);
  }
  if (!conversion.left) pad(zeros ? '0' : ' ', padding, sink);
  escaped ? sink.put_escaped(text) : sink.put(text);
  if (conversion.left) pad(' ', padding, sink);
}

void put_argument(const Conversion& conversion, const LogArgument& argument, TextSink& sink) noexcept {
  char room[kNumberRoom];
  switch (argument.type) {
    case Type::value: return describe(borrowed(argument.value), sink);
    case Type::text: {
      std::string_view text = argument.text;
      if (conversion.precision >= 0) text = text.substr(0, static_cast<std::size_t>(conversion.precision));
      return put_field(conversion, text, true, sink);
    }
    case Type::character: return put_field(conversion, {&argument.character, 1}, true, sink);
    case Type::pointer: return put_field(conversion, format_pointer(argument.pointer, room), false, sink);
    default: return put_field(conversion, format_number(conversion, argument, room), false, sink);
  }
}

}  // namespace

bool format_message(const char* format, std::span<const LogArgument> arguments, TextSink& sink) noexcept {
  if (format == nullptr) return false;
  const std::string_view text(format);
  std::size_t used = 0;
  for (std::size_t at = 0; at < text.size();) {
    const std::size_t percent = std::min(text.find('%', at), text.size());
    sink.put(text.substr(at, percent - at));
    if (percent == text.size()) break;
    at = percent + 1;
    const Conversion conversion = detail::parse_conversion(text, at);
    if (!conversion.valid) return false;
    if (!conversion.takes_argument) {
      sink.put('%');
      continue;
    }
    if (used == arguments.size() || arguments[used].type != conversion.type) return false;
    put_argument(conversion, arguments[used++], sink);
  }
  return used == arguments.size();
}

}  // namespace quorvel
