#include "linux/process/instance_lock.h"

#include <sys/file.h>
#include <sysexits.h>
#include <unistd.h>

#include <cerrno>

#include "linux/base/error_line.h"
#include "platform/descriptor.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"

namespace quorvel::platform::host {

namespace {

[[nodiscard]] bool make_service_directory() noexcept {
  for (const char* path : {paths::kRunDirectory, paths::kServiceDirectory}) {
    if (make_directory(path, 0755) == 0 || errno == EEXIST) continue;
    print_system_error("cannot make the directory %s", path);
    return false;
  }
  return true;
}

// Files that root makes in another user's place keep that user's daemon from starting, and from logging.
[[nodiscard]] bool would_lock_out_the_owner() noexcept {
  if (::geteuid() != 0) return false;
  for (const char* path : {paths::kServiceDirectory, paths::kMobileHome}) {
    struct stat directory;
    if (file_status(path, &directory) != 0 || directory.st_uid == 0) continue;
    print_error_line(
        "%s belongs to user %u: run as that user, not as root; the installed service starts with: systemctl start "
        "quorveld",
        path, static_cast<unsigned>(directory.st_uid));
    return true;
  }
  return false;
}

// Nobody else may open the file: whoever can open it could hold the lock.
[[nodiscard]] Descriptor open_lock_file() noexcept {
  Descriptor file(open_file(paths::kInstanceLock, O_RDWR | O_CREAT | O_NOFOLLOW | O_NONBLOCK, 0600));
  struct stat status;
  if (file && ::fstat(file.get(), &status) == 0 && S_ISREG(status.st_mode)) return file;
  if (file) errno = EINVAL;
  return Descriptor();
}

}  // namespace

int take_instance_lock() noexcept {
  if (would_lock_out_the_owner()) return EX_NOPERM;
  if (!make_service_directory()) return EX_OSERR;
  Descriptor file = open_lock_file();
  if (!file) {
    print_system_error("cannot open the lock file %s", paths::kInstanceLock);
    return EX_OSERR;
  }
  int result = 0;
  do {
    result = ::flock(file.get(), LOCK_EX | LOCK_NB);
  } while (result != 0 && errno == EINTR);
  if (result == 0) {
    static_cast<void>(file.take());
    return 0;
  }
  if (errno == EWOULDBLOCK) {
    print_error_line("another quorveld is running (it holds %s)", paths::kInstanceLock);
    return EX_UNAVAILABLE;
  }
  print_system_error("cannot lock %s", paths::kInstanceLock);
  return EX_OSERR;
}

}  // namespace quorvel::platform::host
