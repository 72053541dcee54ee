#include "log_files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <utility>

#include "common/failure.h"
#include "files.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"

namespace quorvel::tools {
namespace {

constexpr std::size_t kReadSize = 64u << 10;
constexpr std::size_t kRemembered = 256;

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

std::string read_at(const Descriptor& file, off_t offset, std::size_t size) {
  std::string bytes(size, '\0');
  ssize_t count;
  do {
    count = ::pread(file.get(), bytes.data(), bytes.size(), offset);
  } while (count < 0 && errno == EINTR);
  if (count < 0) fail_on("read", paths::kLogFile);
  bytes.resize(static_cast<std::size_t>(count));
  return bytes;
}

}  // namespace

bool LogFiles::open() {
  // A rotation between the two opens would show one file twice or skip one.
  for (;;) {
    Descriptor previous = open_log(paths::kPreviousLogFile);
    Descriptor newest = open_log(paths::kLogFile);
    const Descriptor again = open_log(paths::kPreviousLogFile);
    if (static_cast<bool>(previous) != static_cast<bool>(again) || (previous && !same_file(previous, again))) continue;
    if (!previous) std::swap(previous, newest);
    current_ = {std::move(previous), 0, {}};
    following_ = std::move(newest);
    return static_cast<bool>(current_.file);
  }
}

// True when the bytes in front of the offset are others than those that were read: the file was cut, and may have grown
// again since.
bool LogFiles::Reading::was_written_anew() const {
  return read_at(file, offset - static_cast<off_t>(last.size()), last.size()) != last;
}

std::string LogFiles::Reading::read() {
  std::string bytes = read_at(file, offset, kReadSize);
  offset += static_cast<off_t>(bytes.size());
  last = (last + bytes).substr(last.size() + bytes.size() - std::min(kRemembered, last.size() + bytes.size()));
  return bytes;
}

std::string LogFiles::read() {
  if (!current_.file && !open()) return {};
  for (;;) {
    if (current_.was_written_anew()) {
      current_ = {std::move(current_.file), 0, {}};
      if (std::exchange(line_is_open_, false)) return "\n";
    }
    std::string bytes = current_.read();
    if (!bytes.empty()) {
      line_is_open_ = bytes.back() != '\n';
      return bytes;
    }
    const bool waiting = static_cast<bool>(following_);
    move_on();
    if (!waiting && !following_) return {};
  }
}

// At the end of `current_`: goes on to the file that follows it, or finds out whether one does.
void LogFiles::move_on() {
  if (following_) {
    finished_ = std::move(current_.file);
    current_ = {std::move(following_), 0, {}};
    following_ = Descriptor();
    return;
  }
  Descriptor newest = open_log(paths::kLogFile);
  if (!newest || same_file(newest, current_.file)) return;
  // After two rotations in a row the file in between is the previous generation by now; after a removal it is one that
  // was read already. What was written to `current_` before it was replaced is read first, on the next turn.
  Descriptor previous = open_log(paths::kPreviousLogFile);
  const bool is_between = previous && !same_file(previous, current_.file) && !same_file(previous, finished_);
  following_ = is_between ? std::move(previous) : std::move(newest);
}

}  // namespace quorvel::tools
