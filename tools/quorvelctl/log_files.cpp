#include "log_files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>

#include "common/failure.h"
#include "files.h"
#include "platform/file_system.h"

namespace quorvel::tools {
namespace {

constexpr const char* kLog = "/var/mobile/Library/Logs/quorveld.log";
constexpr const char* kPreviousLog = "/var/mobile/Library/Logs/quorveld.log.1";
constexpr std::size_t kReadSize = 64u << 10;

Descriptor open_log(const char* path) {
  Descriptor file(platform::open_file(path, O_RDONLY | O_NONBLOCK, 0));
  if (!file) {
    if (errno != ENOENT && errno != ENOTDIR) fail_on("open", path);
    return {};
  }
  struct stat status {};
  if (::fstat(file.get(), &status) != 0) fail_on("read", path);
  if (!S_ISREG(status.st_mode)) throw Failure{kUnreachable, std::string(path) + " is not a file, so nothing is logged"};
  return file;
}

bool same_file(const Descriptor& left, const Descriptor& right) {
  struct stat a {};
  struct stat b {};
  if (!left || !right || ::fstat(left.get(), &a) != 0 || ::fstat(right.get(), &b) != 0) return false;
  return a.st_dev == b.st_dev && a.st_ino == b.st_ino;
}

std::string read_some(const Descriptor& file) {
  std::string bytes(kReadSize, '\0');
  ssize_t count;
  do {
    count = ::read(file.get(), bytes.data(), bytes.size());
  } while (count < 0 && errno == EINTR);
  if (count < 0) fail_on("read", kLog);
  bytes.resize(static_cast<std::size_t>(count));
  return bytes;
}

}  // namespace

bool LogFiles::open() {
  // A rotation between the two opens would show one file twice or skip one.
  for (;;) {
    Descriptor previous = open_log(kPreviousLog);
    Descriptor newest = open_log(kLog);
    const Descriptor again = open_log(kPreviousLog);
    if (static_cast<bool>(previous) != static_cast<bool>(again) || (previous && !same_file(previous, again))) continue;
    current_ = previous ? std::move(previous) : std::move(newest);
    following_ = std::move(newest);
    return static_cast<bool>(current_);
  }
}

std::string LogFiles::read() {
  if (!current_ && !open()) return {};
  for (;;) {
    std::string bytes = read_some(current_);
    if (!bytes.empty()) return bytes;
    const bool waiting = static_cast<bool>(following_);
    move_on();
    if (!waiting && !following_) return {};
  }
}

// At the end of `current_`: goes on to the file that follows it, or finds out whether one does.
void LogFiles::move_on() {
  if (following_) {
    current_ = std::move(following_);
    following_ = Descriptor();
    return;
  }
  Descriptor newest = open_log(kLog);
  if (!newest || same_file(newest, current_)) return;
  // After two rotations in a row the file in between is the previous generation by now. What was written to `current_`
  // before it was replaced is read first, on the next turn.
  Descriptor previous = open_log(kPreviousLog);
  following_ = previous && !same_file(previous, current_) ? std::move(previous) : std::move(newest);
}

}  // namespace quorvel::tools
