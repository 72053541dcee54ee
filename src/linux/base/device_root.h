// The device root: the directory that stands for the device's "/", chosen by the environment variable QUORVEL_ROOT
// and settled once, at the first use.
#pragma once

#include <fcntl.h>
#include <sys/types.h>

#include <climits>
#include <cstddef>
#include <string_view>

namespace quorvel::platform::host {

struct DeviceRoot {
  /// The root directory, open for the life of the process; AT_FDCWD when the root is "/" itself, -1 when unusable.
  int descriptor = AT_FDCWD;
  /// Why QUORVEL_ROOT cannot be used: an error number, ENOSYS where the kernel cannot confine paths to a directory (it
  /// has to be Linux 5.6 or later); 0 when it can.
  int error = 0;
  /// The root's own path as the kernel reports it, without a trailing slash: empty for "/".
  std::size_t prefix_length = 0;
  char prefix[PATH_MAX] = {};

  [[nodiscard]] bool is_plain() const noexcept { return descriptor == AT_FDCWD; }
  [[nodiscard]] std::string_view path() const noexcept { return {prefix, prefix_length}; }
};

/// Any thread.
[[nodiscard]] const DeviceRoot& device_root() noexcept;

/// Opens `path` inside the device root, as open(2) does, with O_CLOEXEC added. Returns a descriptor that the caller
/// closes, or -1. Any thread.
[[nodiscard]] int open_in_root(const char* path, int flags, mode_t mode) noexcept;

}  // namespace quorvel::platform::host
