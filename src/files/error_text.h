// The system's text of an error number, for a log line, with the number kept safe from what is called meanwhile.
#pragma once

#include <cerrno>
#include <cstring>

namespace quorvel {

/// Takes errno when it is made and sets it again when it ends, so that a caller further up still
/// finds it there. The text is borrowed and lasts as long as this object. Any thread.
class ErrorText {
 public:
  ErrorText() noexcept : number_(errno), text_(::strerror_r(number_, buffer_, sizeof buffer_)) {}
  ErrorText(const ErrorText&) = delete;
  ErrorText& operator=(const ErrorText&) = delete;
  ~ErrorText() { errno = number_; }

  [[nodiscard]] const char* text() const noexcept { return text_; }

 private:
  char buffer_[64];
  int number_;
  const char* text_;
};

}  // namespace quorvel
