// Lines that clients cause: whoever may call may fail as often as it likes, and must not push other lines out of the
// log by it.
#pragma once

#include <sys/types.h>

#include <string_view>

namespace quorvel {

/// While one lives, what its thread logs is logged for a call of this client: a line that says the same as another of
/// the last second is left out, and one that goes on coming like that, after ten of them, is written once a minute. The
/// next line of whatever thread comes behind one that tells how many were left out.
class ClientLines {
 public:
  ClientLines(uid_t user, pid_t process) noexcept;
  ClientLines(const ClientLines&) = delete;
  ClientLines& operator=(const ClientLines&) = delete;
  ~ClientLines();
};

/// Lines that were left out, and who made the call that caused the last of them.
struct LeftOutLines {
  unsigned long count = 0;
  uid_t user = 0;
  pid_t process = 0;
};

/// Whether a line, given without its head, is to be left out; it is counted then. Any thread that does not hold the log
/// lock.
[[nodiscard]] bool leave_line_out(std::string_view line) noexcept;
/// Lines that were left out since the last call. Any thread.
[[nodiscard]] LeftOutLines take_left_out_lines() noexcept;

}  // namespace quorvel
