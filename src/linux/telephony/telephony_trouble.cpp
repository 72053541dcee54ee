#include "linux/telephony/telephony_trouble.h"

#include <algorithm>
#include <iterator>

#include "linux/base/monotonic_clock.h"

namespace quorvel::platform::host {

namespace {

constexpr std::int64_t kPause = 60'000;  // milliseconds between two lines about the same
constexpr std::size_t kRemembered = 16;

struct Told {
  int trouble = -1;
  int detail = 0;
  std::int64_t when = -1;  // before everything that was told
};

Told told[kRemembered];  // one that is not remembered any more is told again

}  // namespace

bool should_tell(TelephonyTrouble trouble, int detail) noexcept {
  const int kind = static_cast<int>(trouble);
  const std::int64_t now = monotonic_milliseconds();
  Told* entry = std::find_if(std::begin(told), std::end(told),
                             [&](const Told& earlier) { return earlier.trouble == kind && earlier.detail == detail; });
  if (entry == std::end(told)) {
    const auto is_older = [](const Told& left, const Told& right) { return left.when < right.when; };
    entry = std::min_element(std::begin(told), std::end(told), is_older);
  } else if (now - entry->when < kPause) {
    return false;
  }
  *entry = {kind, detail, now};
  return true;
}

}  // namespace quorvel::platform::host
