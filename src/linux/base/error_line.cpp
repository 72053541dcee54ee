#include "linux/base/error_line.h"

#include <algorithm>
#include <cerrno>
#include <cstdarg>
#include <cstddef>
#include <cstdio>
#include <cstring>

#include "platform/error_output.h"

namespace quorvel::platform::host {

namespace {

const char* program_name = "quorveld";

// A line is built in place, cut where it is full.
class ErrorLine {
 public:
  ErrorLine() noexcept { append("%s: ", program_name); }

  [[gnu::format(printf, 2, 3)]] void append(const char* format, ...) noexcept {
    std::va_list arguments;
    va_start(arguments, format);
    append_list(format, arguments);
    va_end(arguments);
  }

  void append_list(const char* format, std::va_list arguments) noexcept {
    const int wanted = std::vsnprintf(text_ + length_, sizeof text_ - length_, format, arguments);
    length_ = std::min(length_ + static_cast<std::size_t>(std::max(wanted, 0)), sizeof text_ - 1);
  }

  void write() noexcept {
    const auto is_control = [](char c) { return static_cast<unsigned char>(c) < ' ' || c == 0x7f; };
    std::replace_if(text_, text_ + length_, is_control, '?');
    text_[length_] = '\n';
    write_error_output({text_, length_ + 1});
  }

 private:
  char text_[1024];
  std::size_t length_ = 0;
};

// Prints one line, with the text of the present error number behind it where that is asked for.
[[gnu::format(printf, 2, 0)]] void print(bool with_error, const char* format, std::va_list arguments) noexcept {
  const int error = errno;
  ErrorLine line;
  line.append_list(format, arguments);
  if (with_error) {
    char text[128];
    line.append(": %s", ::strerror_r(error, text, sizeof text));
  }
  line.write();
  errno = error;
}

}  // namespace

void name_error_lines(const char* program) noexcept { program_name = program; }

void print_error_line(const char* format, ...) noexcept {
  std::va_list arguments;
  va_start(arguments, format);
  print(false, format, arguments);
  va_end(arguments);
}

void print_system_error(const char* format, ...) noexcept {
  std::va_list arguments;
  va_start(arguments, format);
  print(true, format, arguments);
  va_end(arguments);
}

}  // namespace quorvel::platform::host
