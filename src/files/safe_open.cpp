#include "files/safe_open.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstring>
#include <ctime>
#include <utility>

#include "files/error_text.h"
#include "log/daemon_log.h"
#include "platform/descriptor.h"
#include "platform/file_system.h"

namespace quorvel {
namespace {

constexpr const char* kFunction = "_safe_open";

// The last component of a path, null when it cannot name a new file.
const char* new_name(const char* path) noexcept {
  const char* slash = std::strrchr(path, '/');
  const char* name = slash == nullptr ? path : slash + 1;
  const bool special = *name == '\0' || std::strcmp(name, ".") == 0 || std::strcmp(name, "..") == 0;
  return special ? nullptr : name;
}

// Writes the path of an open object into `actual`; false after logging why it cannot be had.
bool query_path(const Descriptor& object, const char* path, char* actual) noexcept {
  if (platform::descriptor_path(object.get(), actual, platform::kPathSize) == 0) return true;
  const ErrorText error;
  daemon_log(1, kFunction, "descriptor-path query of %s failed: %s", path, error.text());
  return false;
}

bool is_same_path(const char* path, const char* actual) noexcept {
  if (std::strcmp(path, actual) == 0) return true;
  const ErrorText kept;
  daemon_log(1, kFunction, "path %s was actually %s, something fishy is going on", path, actual);
  return false;
}

// Creates `path` where it is canonical, so that a refused create leaves no file behind at the end of a linked path: the
// new file is named relative to its directory, once that is open and its own path has been checked, and no change of
// links in between can move it. False when the path was refused, which is then logged; otherwise `file` is what the
// open gave.
bool create(const char* path, int flags, mode_t mode, Descriptor& file) noexcept {
  const char* name = new_name(path);
  const std::size_t path_length = std::strlen(path);
  if (name == nullptr || path_length >= platform::kPathSize) {
    errno = *path == '\0' ? ENOENT : name == nullptr ? EISDIR : ENAMETOOLONG;
    return true;
  }
  char directory[platform::kPathSize];
  std::memcpy(directory, path, path_length + 1);
  const Descriptor parent(platform::open_file(dirname_in_place(directory), O_PATH | O_DIRECTORY, 0));
  if (!parent) return true;
  char actual[2 * platform::kPathSize];
  if (!query_path(parent, path, actual)) return false;
  const std::size_t length = std::strlen(actual);
  std::snprintf(actual + length, sizeof actual - length, "%s%s", length == 1 ? "" : "/", name);
  if (!is_same_path(path, actual)) return false;
  do {
    file = Descriptor(::openat(parent.get(), name, flags | O_CLOEXEC | O_NOCTTY, mode));
  } while (!file && errno == EINTR);
  return true;
}

// An open that does not wait fails while somebody holds a lease on the file, and has the kernel ask for it back: the
// holder gets a moment for that.
Descriptor open_existing(const char* path, int flags) noexcept {
  constexpr int kTries = 20;
  constexpr timespec kPause{0, 50'000'000};
  Descriptor file(platform::open_file(path, flags, 0));
  for (int tries = 1; !file && errno == EWOULDBLOCK && tries < kTries; ++tries) {
    ::nanosleep(&kPause, nullptr);
    file = Descriptor(platform::open_file(path, flags, 0));
  }
  return file;
}

// Opens without truncating anything and without ever waiting for the other end of a FIFO. False after logging why.
bool open_unchecked(const char* path, int flags, mode_t mode, Descriptor& file) noexcept {
  const int careful = (flags & ~O_TRUNC) | O_NOFOLLOW | O_NONBLOCK;
  const bool creates = (flags & O_CREAT) != 0;
  bool missing = creates && (flags & O_EXCL) != 0;
  if (!missing) {
    file = open_existing(path, careful & ~O_CREAT);
    missing = creates && !file && errno == ENOENT;
  }
  if (missing && !create(path, careful, mode, file)) return false;
  if (file) return true;
  const ErrorText error;
  daemon_log(1, kFunction, "open(%s) failed: %s", path, error.text());
  return false;
}

// True when a rename has put another file in the place of the open one since it was opened, while a further name keeps
// it: only then does the system report a removed name with its mark.
bool was_replaced(const char* path, const char* actual) noexcept {
  const std::size_t length = std::strlen(path);
  return std::strncmp(path, actual, length) == 0 && std::strcmp(actual + length, " (deleted)") == 0;
}

// Opens the object that is at `path` and at no other; none after logging why not.
Descriptor open_at_path(const char* path, int flags, mode_t mode) noexcept {
  constexpr int kTries = 10;
  char actual[platform::kPathSize];
  for (int tries = 1;; ++tries) {
    Descriptor file;
    if (!open_unchecked(path, flags, mode, file) || !query_path(file, path, actual)) return {};
    if (was_replaced(path, actual) && (flags & O_EXCL) == 0 && tries < kTries) continue;
    return is_same_path(path, actual) ? std::move(file) : Descriptor();
  }
}

bool has_type(const Descriptor& file, const char* path, mode_t expected_type) noexcept {
  struct stat status;
  if (::fstat(file.get(), &status) != 0) {
    const ErrorText error;
    daemon_log(1, kFunction, "fstat(%s) failed: %s", path, error.text());
    return false;
  }
  const mode_t type = status.st_mode & kFileTypeMask;
  if (type == expected_type) return true;
  const ErrorText kept;
  daemon_log(1, kFunction, "%s type is %d, not %d", path, static_cast<int>(type), static_cast<int>(expected_type));
  return false;
}

// Does the part of the open that had to wait for the checks: the caller's own flags, and the truncation. A failure is
// logged as a failed open.
bool finish_open(const Descriptor& file, const char* path, int flags, mode_t type) noexcept {
  int result = 0;
  // F_SETFL ignores the flags that cannot change after an open.
  if ((flags & O_NONBLOCK) == 0) result = ::fcntl(file.get(), F_SETFL, flags);
  if (result == 0 && (flags & O_TRUNC) != 0 && type == kRegularFile) {
    do {
      result = ::ftruncate(file.get(), 0);
    } while (result != 0 && errno == EINTR);
  }
  if (result == 0) return true;
  const ErrorText error;
  daemon_log(1, kFunction, "open(%s) failed: %s", path, error.text());
  return false;
}

}  // namespace

int _safe_open(const char* path, int flags, mode_t mode, mode_t expected_type) noexcept {
  Descriptor file = open_at_path(path, flags, mode);
  if (!file || !has_type(file, path, expected_type)) return -1;
  if (!finish_open(file, path, flags, expected_type)) return -1;
  return file.take();
}

int safe_open(const char* path, int flags, mode_t expected_type) noexcept {
  if ((flags & O_CREAT) != 0) {
    daemon_log(0, "safe_open", "safe_open can't be used to create %s", path);
    errno = EINVAL;
    return -1;
  }
  return _safe_open(path, flags, 0, expected_type);
}

}  // namespace quorvel
