// daemon_log: how every part of the daemon reports what it does, one line at a time.
//
// The format is checked against its arguments when the code is compiled. Conversions:
//
//   %s            const char* (null prints "(null)") or std::string_view
//   %d %i         int; with l or ll: long, long long
//   %u %o %x %X   unsigned int; with l, ll or z: unsigned long, unsigned long long, std::size_t
//   %p            const void*
//   %c            char
//   %@            PropertyValue, as its description (property/description.h)
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

/// One argument of a log line. It refers to the value that it was made from, which must outlast it.
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

/// One conversion of a format, taken apart.
struct Conversion {
  bool valid = false;
  bool takes_argument = false;
  LogArgument::Type type = LogArgument::Type::text;  // of the argument, where it takes one
  char letter = 0;
  bool left = false;
  bool zero = false;
  int width = 0;
  int precision = -1;
};

/// A letter that ends a conversion, and the argument it asks for; `wide` is what l, ll or z before it make of that.
struct ConversionLetter {
  char letter;
  LogArgument::Type type;
  LogArgument::Type wide;  // the type itself: nothing of this kind may stand before the letter
};
inline constexpr ConversionLetter kConversionLetters[] = {
    {'@', LogArgument::Type::value, LogArgument::Type::value},
    {'s', LogArgument::Type::text, LogArgument::Type::text},
    {'d', LogArgument::Type::int_, LogArgument::Type::long_},
    {'i', LogArgument::Type::int_, LogArgument::Type::long_},
    {'u', LogArgument::Type::unsigned_int, LogArgument::Type::unsigned_long},
    {'o', LogArgument::Type::unsigned_int, LogArgument::Type::unsigned_long},
    {'x', LogArgument::Type::unsigned_int, LogArgument::Type::unsigned_long},
    {'X', LogArgument::Type::unsigned_int, LogArgument::Type::unsigned_long},
    {'p', LogArgument::Type::pointer, LogArgument::Type::pointer},
    {'c', LogArgument::Type::character, LogArgument::Type::character},
};

/// Moves `at` behind `byte` where it stands at `format[at]`, and tells whether it did.
constexpr bool skip(std::string_view format, std::size_t& at, char byte) noexcept {
  if (at >= format.size() || format[at] != byte) return false;
  ++at;
  return true;
}

/// The number in decimal digits at `format[at]`, 0 without a digit; moves `at` behind it. Five digits at most.
constexpr int parse_number(std::string_view format, std::size_t& at) noexcept {
  int number = 0;
  for (; at < format.size() && format[at] >= '0' && format[at] <= '9' && number < 10'000; ++at) {
    number = number * 10 + (format[at] - '0');
  }
  return number;
}

/// Takes the conversion apart whose percent sign stands right before `format[at]`; moves `at` behind it. The result is
/// not valid when there is no such conversion.
constexpr Conversion parse_conversion(std::string_view format, std::size_t& at) noexcept {
  Conversion result;
  for (;;) {
    if (skip(format, at, '-')) {
      result.left = true;
    } else if (skip(format, at, '0')) {
      result.zero = true;
    } else {
      break;
    }
  }
  result.width = parse_number(format, at);
  if (skip(format, at, '.')) result.precision = parse_number(format, at);
  bool is_wide = skip(format, at, 'z');
  if (!is_wide && skip(format, at, 'l')) {
    is_wide = true;
    skip(format, at, 'l');
  }
  result.letter = at < format.size() ? format[at] : '\0';
  ++at;
  result.takes_argument = result.letter != '%';
  result.valid = !result.takes_argument;
  for (const ConversionLetter& row : kConversionLetters) {
    if (row.letter != result.letter) continue;
    result.type = is_wide ? row.wide : row.type;
    result.valid = !is_wide || row.wide != row.type;
    break;
  }
  return result;
}

/// The format of a line, which does not compile unless its conversions fit the types of the arguments.
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
