#include "linux/base/device_root.h"

#include <linux/openat2.h>
#include <sys/syscall.h>
#include <unistd.h>

#include <cerrno>
#include <cstdint>
#include <cstdio>
#include <cstdlib>

namespace quorvel::platform::host {

namespace {

// A resolution that meets a rename at the same time is reported as EAGAIN and may be tried again. The bound is for
// opens that give EAGAIN for reasons of their own.
constexpr int kMaximumTries = 1000;

void read_prefix(DeviceRoot& root) noexcept {
  char link[sizeof "/proc/self/fd/" + 10];
  std::snprintf(link, sizeof link, "/proc/self/fd/%d", root.descriptor);
  const ssize_t length = ::readlink(link, root.prefix, sizeof root.prefix);
  if (length < 0 || static_cast<std::size_t>(length) == sizeof root.prefix) {
    root.error = length < 0 ? errno : ENAMETOOLONG;
    return;
  }
  root.prefix_length = length == 1 ? 0 : static_cast<std::size_t>(length);
}

[[nodiscard]] int try_open(const DeviceRoot& root, const char* path, int flags, mode_t mode) noexcept {
  if (root.is_plain()) return ::open(path, flags, mode);
  // openat2 refuses a mode where nothing can be created, which open ignores.
  const bool creates = (flags & O_CREAT) != 0 || (flags & O_TMPFILE) == O_TMPFILE;
  struct open_how how = {};
  how.flags = static_cast<std::uint64_t>(flags);
  how.mode = creates ? mode & 07777 : 0;
  how.resolve = RESOLVE_IN_ROOT;
  return static_cast<int>(::syscall(SYS_openat2, root.descriptor, path, &how, sizeof how));
}

[[nodiscard]] DeviceRoot settle_device_root() noexcept {
  DeviceRoot root;
  const char* value = std::getenv("QUORVEL_ROOT");
  if (value == nullptr) return root;
  root.descriptor = -1;
  if (value[0] != '/') {
    root.error = EINVAL;
    return root;
  }
  root.descriptor = ::open(value, O_PATH | O_DIRECTORY | O_CLOEXEC);
  if (root.descriptor < 0) {
    root.error = errno;
    return root;
  }
  read_prefix(root);
  // A kernel without openat2 is noticed here, at the start, and not at each path.
  const int found = try_open(root, "/", O_PATH | O_CLOEXEC, 0);
  if (found < 0 && errno == ENOSYS) root.error = ENOSYS;
  if (found >= 0) ::close(found);
  return root;
}

}  // namespace

const DeviceRoot& device_root() noexcept {
  static const DeviceRoot root = settle_device_root();
  return root;
}

int open_in_root(const char* path, int flags, mode_t mode) noexcept {
  const DeviceRoot& root = device_root();
  if (root.error != 0) {
    errno = root.error;
    return -1;
  }
  for (int tries = 0;;) {
    const int descriptor = try_open(root, path, flags | O_CLOEXEC, mode);
    if (descriptor >= 0) return descriptor;
    if (errno == EINTR) continue;
    if (errno != EAGAIN || root.is_plain() || ++tries == kMaximumTries) return -1;
  }
}

}  // namespace quorvel::platform::host
