#include <unistd.h>

#include <cerrno>
#include <charconv>
#include <climits>
#include <cstring>
#include <string_view>

#include "linux/base/device_root.h"
#include "platform/file_system.h"

namespace quorvel::platform {

namespace {

constexpr std::string_view kRemovedSuffix = " (deleted)";

// The path that the kernel reports for an open object, in `buffer`; empty with errno set when there is none.
[[nodiscard]] std::string_view reported_path(int descriptor, char (&buffer)[PATH_MAX + 1]) noexcept {
  constexpr std::string_view directory = "/proc/self/fd/";
  char link[directory.size() + 12] = "/proc/self/fd/";
  *std::to_chars(link + directory.size(), link + sizeof link - 1, descriptor).ptr = '\0';
  const ssize_t length = ::readlink(link, buffer, sizeof buffer);
  if (length < 0) return {};
  if (static_cast<std::size_t>(length) == sizeof buffer) {
    errno = ENAMETOOLONG;
    return {};
  }
  return {buffer, static_cast<std::size_t>(length)};
}

// Takes off the root's own path. Empty with errno set when the object lies outside the root or has no path at all.
[[nodiscard]] std::string_view seen_from_root(std::string_view path) noexcept {
  const host::DeviceRoot& root = host::device_root();
  if (root.error == 0 && path.starts_with(root.path())) {
    path.remove_prefix(root.prefix_length);
    if (path.empty()) return "/";
    if (path.front() == '/') return path;
  }
  errno = root.error != 0 ? root.error : ENOENT;
  return {};
}

}  // namespace

int descriptor_path(int descriptor, char* path, std::size_t size) noexcept {
  char buffer[PATH_MAX + 1];
  std::string_view found = reported_path(descriptor, buffer);
  if (found.empty()) return -1;
  // The status is asked for after the path: an object that is removed between the two was not yet marked as such, while
  // the other order could meet the mark with a count from before.
  if (found.ends_with(kRemovedSuffix)) {
    struct stat status;
    if (::fstat(descriptor, &status) != 0) return -1;
    if (status.st_nlink == 0) found.remove_suffix(kRemovedSuffix.size());
  }
  found = seen_from_root(found);
  if (found.empty()) return -1;
  if (found.size() >= size) {
    errno = ENAMETOOLONG;
    return -1;
  }
  std::memcpy(path, found.data(), found.size());
  path[found.size()] = '\0';
  return 0;
}

}  // namespace quorvel::platform
