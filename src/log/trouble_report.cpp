#include "log/trouble_report.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>

#include "platform/error_output.h"

namespace quorvel {

namespace {

constexpr time_t kInterval = 60;

time_t last_report = 0;
unsigned long suppressed = 0;

// True when a report is due now; the log lock guards both.
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

}  // namespace

TroubleReport::~TroubleReport() {
  if (length_ > 0) platform::write_error_output({text_, length_});
}

void TroubleReport::finish(int length) noexcept {
  constexpr std::size_t kLast = sizeof text_ - 1;
  std::size_t used = std::min(static_cast<std::size_t>(std::max(length, 0)), kLast);
  if (suppressed > 0 && used < kLast) {
    used += static_cast<std::size_t>(
        std::max(0, std::snprintf(text_ + used, kLast - used, " (and %lu more such failures)", suppressed)));
    suppressed = 0;
  }
  length_ = std::min(used, kLast);
  text_[length_++] = '\n';
}

void TroubleReport::call_failed(const char* what, const char* path) noexcept {
  const int error = errno;
  if (!is_due()) return;
  const char* description = strerrordesc_np(error);
  finish(std::snprintf(text_, sizeof text_, "quorveld: _safe_open: %s(%s) failed: %s", what, path,
                       description == nullptr ? "unknown error" : description));
}

void TroubleReport::wrong_type(const char* path, unsigned found, unsigned expected) noexcept {
  if (!is_due()) return;
  finish(std::snprintf(text_, sizeof text_, "quorveld: _safe_open: %s type is %u, not %u", path, found, expected));
}

}  // namespace quorvel
