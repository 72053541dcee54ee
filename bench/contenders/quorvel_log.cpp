// The daemon's log, and the limit: the bytes of such a line written, and nothing else.
#include <fcntl.h>
#include <unistd.h>

#include <atomic>
#include <cstring>

#include "bench/cases/log_cases.h"
#include "bench/support/files.h"
#include "bench/support/measurements.h"
#include "bench/support/scratch_root.h"
#include "log/daemon_log.h"
#include "log/log_writer.h"

namespace quorvel::bench {
namespace {

class DaemonLog {
 public:
  void write(unsigned number, unsigned thread) {
    daemon_log(0, "data_ark_set", "dirtied by changing %s: %u line %u", "com.Orvane.mobile.domain123-Key45", thread,
               number);
  }
  [[nodiscard]] static std::vector<std::filesystem::path> files() {
    const std::filesystem::path file = scratch_root().log_file();
    return {file.string() + ".1", file};
  }
};

/// A file that is emptied where a log would be rotated.
class BareLog {
 public:
  void write(unsigned number, unsigned thread) {
    char line[] =
        "Thu Jan  1 00:00:00 2026 pid=12345 (0x7f0123456789) data_ark_set: dirtied by changing "
        "com.Orvane.mobile.domain123-Key45: T line 0000000000\n";
    char* at = line + sizeof line - 3;
    for (unsigned rest = number; rest != 0; rest /= 10) *at-- = static_cast<char>('0' + rest % 10);
    *std::strrchr(line, 'T') = static_cast<char>('0' + thread);
    constexpr std::size_t kLength = sizeof line - 1;
    write_whole(file_.get(), std::as_bytes(std::span(line, kLength)));
    if ((written_ += kLength) < kRotationThreshold) return;
    if (::ftruncate(file_.get(), 0) == 0) written_ = 0;
  }
  [[nodiscard]] static std::vector<std::filesystem::path> files() { return {scratch_root().outside() / "bare.log"}; }

 private:
  Descriptor file_ = open_file(files()[0], O_WRONLY | O_APPEND | O_CREAT | O_TRUNC);
  std::atomic<std::int64_t> written_ = 0;
};

[[maybe_unused]] const bool registered = register_log<DaemonLog>(kOurs) && register_log<BareLog>(kLimit);

}  // namespace
}  // namespace quorvel::bench
