#include "log/log_writer.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cerrno>
#include <cstdio>
#include <cstring>

#include "log/trouble_report.h"
#include "platform/descriptor.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"
#include "platform/lock.h"

namespace quorvel {

namespace {

constexpr mode_t kTypeMask = 0xF000;
constexpr mode_t kRegular = 0x8000;
constexpr mode_t kCreationMode = 0644;

constinit Lock log_lock;
int log_descriptor QUORVEL_GUARDED_BY(log_lock) = -1;
std::int64_t byte_count QUORVEL_GUARDED_BY(log_lock) = 0;
constinit std::atomic<bool> took_last_line = true;

// O_NONBLOCK: a FIFO at the log's path must not stop the thread that opens it.
Descriptor open_log(TroubleReport& trouble) noexcept {
  Descriptor file(
      platform::open_file(paths::kLogFile, O_WRONLY | O_APPEND | O_CREAT | O_NOFOLLOW | O_NONBLOCK, kCreationMode));
  if (!file) {
    trouble.call_failed("open", paths::kLogFile);
    return {};
  }
  char path[platform::kPathSize];
  if (platform::descriptor_path(file.get(), path, sizeof path) != 0) {
    trouble.call_failed("descriptor path", paths::kLogFile);
    return {};
  }
  struct stat status {};
  if (fstat(file.get(), &status) != 0) {
    trouble.call_failed("fstat", paths::kLogFile);
    return {};
  }
  if ((status.st_mode & kTypeMask) != kRegular) {
    trouble.wrong_type(paths::kLogFile, status.st_mode & kTypeMask, kRegular);
    return {};
  }
  fcntl(file.get(), F_SETFL, O_APPEND);
  return file;
}

void close_log() noexcept QUORVEL_REQUIRES(log_lock) {
  close(log_descriptor);
  log_descriptor = -1;
}

bool ensure_open(TroubleReport& trouble) noexcept QUORVEL_REQUIRES(log_lock) {
  if (log_descriptor >= 0) return true;
  Descriptor file = open_log(trouble);
  if (!file) return false;
  log_descriptor = file.take();
  struct stat status {};
  byte_count = fstat(log_descriptor, &status) == 0 ? static_cast<std::int64_t>(status.st_size) : 0;
  return true;
}

bool write_whole(const char* line, std::size_t length, TroubleReport& trouble) noexcept QUORVEL_REQUIRES(log_lock) {
  ssize_t written = 0;
  do {
    written = write(log_descriptor, line, length);
  } while (written < 0 && errno == EINTR);
  if (written == static_cast<ssize_t>(length)) return true;
  if (written >= 0) errno = ENOSPC;
  trouble.call_failed("write", paths::kLogFile);
  return false;
}

}  // namespace

bool log_took_last_line() noexcept { return took_last_line; }

int log_rotate_if_needed(const char* path, std::int64_t count) noexcept {
  if (count < kRotationThreshold) return 0;
  char previous[platform::kPathSize];
  std::snprintf(previous, sizeof previous, "%s.1", path);
  platform::remove_file(previous);
  // A file that cannot be moved goes on growing; the next line tries again.
  static_cast<void>(platform::rename_file(path, previous));
  return 1;
}

void log_write_line(const char* line) noexcept {
  const std::size_t length = std::strlen(line);
  TroubleReport trouble;  // ends, and writes, behind the lock
  const LockHold hold(log_lock);
  took_last_line = ensure_open(trouble) && write_whole(line, length, trouble);
  if (log_descriptor < 0) return;
  byte_count += static_cast<std::int64_t>(length);
  if (log_rotate_if_needed(paths::kLogFile, byte_count) == 1) close_log();
}

}  // namespace quorvel
