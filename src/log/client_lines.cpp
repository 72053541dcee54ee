#include "log/client_lines.h"

#include <algorithm>
#include <atomic>
#include <cstdint>
#include <ctime>

#include "platform/lock.h"
#include "property/hash.h"

namespace quorvel {

namespace {

struct Client {
  bool calls;
  uid_t user;
  pid_t process;
};
thread_local constinit Client client{};

// A line that was written for a client.
struct Told {
  std::uint32_t hash;
  int times;  // in a row; 0 for no line
  std::int64_t when;
};

constexpr std::int64_t kSecond = 1000, kMinute = 60 * kSecond;
constexpr int kOftenEnough = 10;
// More lines than the operations have, each of which is told several times where a file goes through several states.
constexpr int kTold = 16;

constinit Lock told_lock;
Told told[kTold] QUORVEL_GUARDED_BY(told_lock) = {};
LeftOutLines left_out QUORVEL_GUARDED_BY(told_lock);
constinit std::atomic<bool> any_left_out = false;

std::int64_t milliseconds_now() noexcept {
  timespec now{};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return std::int64_t{now.tv_sec} * kSecond + now.tv_nsec / 1'000'000;
}

// The place of the line with this hash, or the one that was used longest ago.
Told& place_of(std::uint32_t hash) noexcept QUORVEL_REQUIRES(told_lock) {
  Told* oldest = told;
  for (Told& line : told) {
    if (line.times > 0 && line.hash == hash) return line;
    if (line.times == 0 || (oldest->times > 0 && line.when < oldest->when)) oldest = &line;
  }
  *oldest = {hash, 0, 0};
  return *oldest;
}

}  // namespace

ClientLines::ClientLines(uid_t user, pid_t process) noexcept { client = {true, user, process}; }
ClientLines::~ClientLines() { client.calls = false; }

bool leave_line_out(std::string_view line) noexcept {
  if (!client.calls) return false;
  const std::int64_t now = milliseconds_now();
  const std::uint32_t hash = detail::hash_text(line);
  const LockHold hold(told_lock);
  Told& same = place_of(hash);
  const std::int64_t interval = same.times > kOftenEnough ? kMinute : kSecond;
  if (same.times > 0 && now - same.when < interval) {
    left_out = {left_out.count + 1, client.user, client.process};
    any_left_out = true;
    return true;
  }
  const bool goes_on = same.times > 0 && now - same.when < 2 * interval;
  same.times = goes_on ? std::min(same.times + 1, kOftenEnough + 1) : 1;
  same.when = now;
  return false;
}

LeftOutLines take_left_out_lines() noexcept {
  if (!any_left_out) return {};
  const LockHold hold(told_lock);
  const LeftOutLines taken = left_out;
  left_out = {};
  any_left_out = false;
  return taken;
}

}  // namespace quorvel
