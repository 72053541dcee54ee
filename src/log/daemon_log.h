// daemon_log: how every part of the daemon reports what it does, one line at a time.
//
// The format is checked against its arguments when the code is compiled. Conversions:
//
//   %s            const char* (null prints "(null)") or std::string_view
//   %d %i         int; with l or ll: long, long long
//   %u %o %x %X   unsigned int; with l, ll or z: unsigned long, unsigned long long, std::size_t
//   %p            const void*
//   %c            char
//   %@            PropertyValue, as its description (platform/property/description.h)
//   %%            a percent sign
//
// with the flags - and 0, a width, and a precision for %s. Control characters in inserted texts are escaped: no value
// can forge or break a line.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>
#include <string_view>
#include <type_traits>

#include "property/value.h"

namespace quorvel {

/// Whether the daemon writes its detail lines. 1 from process start until `setup_extended_logging` settles it; read
/// without a lock.
extern int extended_logging;

/// One argument of a log line, referring to what it was made from.
class LogArgument {
 public:
  enum class Type : std::uint8_t { text, value, int_, long_, unsigned_int, unsigned_long, pointer, character };

  LogArgument(const char* argument) noexcept : type(Type::text), text(argument == nullptr ? "(null)" : argument) {}
  LogArgument(std::string_view argument) noexcept : type(Type::text), text(argument) {}
  LogArgument(const PropertyValue& argument) noexcept : type(Type::value), value(argument.word()) {}
  LogArgument(int argument) noexcept : type(Type::int_), number(argument) {}
  LogArgument(long argument) noexcept : type(Type::long_), number(argument) {}
  LogArgument(long long argument) noexcept : type(Type::long_), number(argument) {}
  LogArgument(unsigned argument) noexcept : type(Type::unsigned_int), unsigned_number(argument) {}
  LogArgument(unsigned long argument) noexcept : type(Type::unsigned_long), unsigned_number(argument) {}
  LogArgument(unsigned long long argument) noexcept : type(Type::unsigned_long), unsigned_number(argument) {}
  LogArgument(const void* argument) noexcept : type(Type::pointer), pointer(argument) {}
  LogArgument(char argument) noexcept : type(Type::character), character(argument) {}

  Type type;
  union {
    std::string_view text;
    detail::Word value;  // borrowed
    std::int64_t number;
    std::uint64_t unsigned_number;
    const void* pointer;
    char character;
  };
};

namespace detail {

template <class T>
consteval LogArgument::Type log_argument_type() {
  using Type = LogArgument::Type;
  using D = std::decay_t<T>;
  if constexpr (std::is_same_v<D, int>)
    return Type::int_;
  else if constexpr (std::is_same_v<D, long> || std::is_same_v<D, long long>)
    return Type::long_;
  else if constexpr (std::is_same_v<D, unsigned>)
    return Type::unsigned_int;
  else if constexpr (std::is_same_v<D, unsigned long> || std::is_same_v<D, unsigned long long>)
    return Type::unsigned_long;
  else if constexpr (std::is_same_v<D, char>)
    return Type::character;
  else if constexpr (std::is_convertible_v<D, const char*> || std::is_same_v<D, std::string_view>)
    return Type::text;
  else if constexpr (std::is_convertible_v<D, const void*>)
    return Type::pointer;
  else
    return Type::value;
}

/// The argument type that the conversion at `format[at]` (just behind its percent sign) asks for; moves `at` behind the
/// conversion. False when there is no such conversion. `type` is left alone for %%, which asks for nothing.
struct Conversion {
  bool valid = false;
  bool takes_argument = false;
  LogArgument::Type type = LogArgument::Type::text;
  char letter = 0;
  bool left = false;
  bool zero = false;
  int width = 0;
  int precision = -1;
};

constexpr Conversion parse_conversion(std::string_view format, std::size_t& at) noexcept {
  Conversion result;
  const auto peek = [&] { return at < format.size() ? format[at] : '\0'; };
  const auto number = [&] {
    int value = 0;
    while (peek() >= '0' && peek() <= '9' && value < 10'000) value = value * 10 + (format[at++] - '0');
    return value;
  };
  for (; peek() == '-' || peek() == '0'; ++at) (peek() == '-' ? result.left : result.zero) = true;
  result.width = number();
  if (peek() == '.') result.precision = (++at, number());
  bool wide = false;
  if (peek() == 'z')
    wide = (++at, true);
  else
    for (int i = 0; i < 2 && peek() == 'l'; ++i) wide = (++at, true);
  result.letter = peek();
  ++at;
  result.takes_argument = result.letter != '%';
  result.valid = true;
  using Type = LogArgument::Type;
  switch (result.letter) {
    case 'd':
    case 'i': result.type = wide ? Type::long_ : Type::int_; break;
    case 'u':
    case 'o':
    case 'x':
    case 'X': result.type = wide ? Type::unsigned_long : Type::unsigned_int; break;
    case 's':
      result.type = Type::text;
      result.valid = !wide;
      break;
    case 'p':
      result.type = Type::pointer;
      result.valid = !wide;
      break;
    case 'c':
      result.type = Type::character;
      result.valid = !wide;
      break;
    case '@':
      result.type = Type::value;
      result.valid = !wide;
      break;
    case '%': break;
    default: result.valid = false;
  }
  return result;
}

template <class... Arguments>
class CheckedFormat {
 public:
  consteval CheckedFormat(const char* format) : format_(format) {
    constexpr LogArgument::Type types[] = {log_argument_type<Arguments>()..., LogArgument::Type::text};
    const std::string_view text(format);
    std::size_t used = 0;
    for (std::size_t at = 0; at < text.size();) {
      if (text[at++] != '%') continue;
      const Conversion conversion = parse_conversion(text, at);
      if (!conversion.valid) refuse_to_compile("unknown conversion in a log format");
      if (!conversion.takes_argument) continue;
      if (used == sizeof...(Arguments)) refuse_to_compile("a log format asks for more arguments than it is given");
      if (types[used++] != conversion.type)
        refuse_to_compile("a log argument is not of the kind its conversion asks for");
    }
    if (used != sizeof...(Arguments)) refuse_to_compile("a log format leaves arguments unused");
  }
  [[nodiscard]] const char* text() const noexcept { return format_; }

 private:
  const char* format_;
};

}  // namespace detail

/// Writes one line whose format is not known to the compiler; see `daemon_log`. A format that is null or does not fit
/// its arguments becomes the fallback text.
void daemon_log_arguments(int level, const char* function, const char* format,
                          std::span<const LogArgument> arguments) noexcept;

/// Writes one line to the daemon's log. `level` is ignored. `function` names the calling function or step, or is null.
/// A line that cannot be written is lost; nothing is reported to the caller. Any thread, any time, but not from inside
/// the log writer.
template <class... Arguments>
void daemon_log(int level, const char* function, detail::CheckedFormat<std::type_identity_t<Arguments>...> format,
                const Arguments&... arguments) noexcept {
  if constexpr (sizeof...(Arguments) == 0) {
    daemon_log_arguments(level, function, format.text(), {});
  } else {
    const LogArgument list[] = {LogArgument(arguments)...};
    daemon_log_arguments(level, function, format.text(), list);
  }
}

}  // namespace quorvel
