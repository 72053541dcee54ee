#include "log/line_head.h"

#include <pthread.h>
#include <unistd.h>

#include <algorithm>
#include <cstdio>
#include <ctime>

#include "platform/lock.h"

namespace quorvel {

namespace {

struct Head {
  time_t second;
  pid_t process;
  std::size_t length;
  char text[128];
};
thread_local constinit Head head{-1, 0, 0, {}};

constinit Lock zone_lock;

// The form of ctime, whose own function fails for the years it has no room for.
int format_stamp(time_t second, char* out, std::size_t room) noexcept {
  constexpr const char* kDays[] = {"Sun", "Mon", "Tue", "Wed", "Thu", "Fri", "Sat"};
  constexpr const char* kMonths[] = {"Jan", "Feb", "Mar", "Apr", "May", "Jun",
                                     "Jul", "Aug", "Sep", "Oct", "Nov", "Dec"};
  {
    // The zone may have changed since the last second, on a device that travels. Other threads read what is set here.
    const LockHold hold(zone_lock);
    ::tzset();
  }
  struct tm local {};
  if (localtime_r(&second, &local) == nullptr) return std::snprintf(out, room, "@%lld", static_cast<long long>(second));
  return std::snprintf(out, room, "%s %s %2d %02d:%02d:%02d %lld", kDays[local.tm_wday], kMonths[local.tm_mon],
                       local.tm_mday, local.tm_hour, local.tm_min, local.tm_sec, 1900LL + local.tm_year);
}

void make_head(time_t second) noexcept {
  char stamp[48];
  format_stamp(second, stamp, sizeof stamp);
  head.second = second;
  head.process = getpid();
  const int length = std::snprintf(head.text, sizeof head.text, "%s pid=%d (0x%lx) ", stamp, head.process,
                                   static_cast<unsigned long>(pthread_self()));
  head.length = std::min(static_cast<std::size_t>(std::max(length, 0)), sizeof head.text - 1);
}

}  // namespace

std::string_view line_head() noexcept {
  const time_t now = time(nullptr);
  if (now != head.second || head.length == 0) make_head(now);
  return {head.text, head.length};
}

}  // namespace quorvel
