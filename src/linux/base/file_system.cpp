#include "platform/file_system.h"

#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstring>

#include "linux/base/device_root.h"
#include "platform/descriptor.h"

namespace quorvel::platform {

namespace {

// Where a path's last component lies. The calls that make, remove and rename an entry have no variant that resolves
// inside a root, so the directory is resolved there first and the call is given the entry's bare name.
class EntryPlace {
 public:
  explicit EntryPlace(const char* path) noexcept : name_(path) {
    if (host::device_root().is_plain()) return;
    descriptor_ = -1;
    const std::size_t length = std::strlen(path);
    if (length == 0 || length >= PATH_MAX) {
      errno = length == 0 ? ENOENT : ENAMETOOLONG;
      return;
    }
    resolve(path, length);
  }

  [[nodiscard]] explicit operator bool() const noexcept { return descriptor_ != -1; }
  [[nodiscard]] int directory() const noexcept { return descriptor_; }
  [[nodiscard]] const char* name() const noexcept { return name_; }

 private:
  void resolve(const char* path, std::size_t length) noexcept {
    std::size_t end = length;
    while (end > 0 && path[end - 1] == '/') --end;
    std::size_t start = end;
    while (start > 0 && path[start - 1] != '/') --start;
    name_ = end == 0 ? "." : path + start;
    char parent[PATH_MAX] = "/";
    if (start > 0) {
      std::memcpy(parent, path, start);
      parent[start] = '\0';
    }
    holder_ = Descriptor(host::open_in_root(parent, O_PATH | O_DIRECTORY, 0));
    descriptor_ = holder_.get();
  }

  Descriptor holder_;
  int descriptor_ = AT_FDCWD;
  const char* name_;
};

template <typename Call>
[[nodiscard]] int uninterrupted(Call call) noexcept {
  int result = call();
  while (result != 0 && errno == EINTR) result = call();
  return result;
}

}  // namespace

int open_file(const char* path, int flags, mode_t mode) noexcept {
  return host::open_in_root(path, (flags & O_PATH) != 0 ? flags : flags | O_NOCTTY, mode);
}

int file_status(const char* path, struct stat* status) noexcept {
  if (host::device_root().is_plain()) return uninterrupted([=] { return ::stat(path, status); });
  const Descriptor object(host::open_in_root(path, O_PATH, 0));
  return object ? ::fstat(object.get(), status) : -1;
}

int make_directory(const char* path, mode_t mode) noexcept {
  const EntryPlace place(path);
  if (!place) return -1;
  return uninterrupted([&] { return ::mkdirat(place.directory(), place.name(), mode); });
}

int remove_file(const char* path) noexcept {
  const EntryPlace place(path);
  if (!place) return -1;
  return uninterrupted([&] { return ::unlinkat(place.directory(), place.name(), 0); });
}

int rename_file(const char* from, const char* to) noexcept {
  const EntryPlace source(from);
  if (!source) return -1;
  const EntryPlace target(to);
  if (!target) return -1;
  return uninterrupted(
      [&] { return ::renameat(source.directory(), source.name(), target.directory(), target.name()); });
}

int flush_file(int descriptor) noexcept {
  return uninterrupted([=] { return ::fdatasync(descriptor); });
}

int flush_directory(const char* path) noexcept {
  const Descriptor directory(open_file(path, O_RDONLY | O_DIRECTORY, 0));
  return directory ? flush_file(directory.get()) : -1;
}

}  // namespace quorvel::platform
