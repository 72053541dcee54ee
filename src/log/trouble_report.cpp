#include "log/trouble_report.h"

#include <string.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>

namespace quorvel {

namespace {

constexpr time_t kInterval = 60;

time_t last_report = 0;
unsigned long suppressed = 0;

// True when a report is due now.
bool is_due() noexcept {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  if (last_report != 0 && now.tv_sec - last_report < kInterval) {
    ++suppressed;
    return false;
  }
  last_report = std::max<time_t>(now.tv_sec, 1);
  return true;
}

void write_report(char* text, int length, std::size_t room) noexcept {
  auto used = std::min(static_cast<std::size_t>(std::max(length, 0)), room - 1);
  if (suppressed > 0 && used < room - 1) {
    used += static_cast<std::size_t>(
        std::max(0, std::snprintf(text + used, room - used, " (and %lu more such failures)", suppressed)));
    suppressed = 0;
  }
  used = std::min(used, room - 2);
  text[used] = '\n';
  // Standard error is a courtesy: nobody is told when it fails as well.
  static_cast<void>(!write(STDERR_FILENO, text, used + 1));
}

}  // namespace

void report_log_trouble(const char* what, const char* path) noexcept {
  const int error = errno;
  if (!is_due()) return;
  char text[512];
  const char* description = strerrordesc_np(error);
  write_report(text,
               std::snprintf(text, sizeof text, "quorveld: _safe_open: %s(%s) failed: %s", what, path,
                             description == nullptr ? "unknown error" : description),
               sizeof text);
}

void report_log_type(const char* path, unsigned found, unsigned expected) noexcept {
  if (!is_due()) return;
  char text[512];
  write_report(text,
               std::snprintf(text, sizeof text, "quorveld: _safe_open: %s type is %u, not %u", path, found, expected),
               sizeof text);
}

}  // namespace quorvel
