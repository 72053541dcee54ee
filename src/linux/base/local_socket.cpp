#include "linux/base/local_socket.h"

#include <fcntl.h>
#include <sys/socket.h>
#include <sys/stat.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstddef>
#include <cstdio>
#include <cstring>

#include "platform/file_system.h"
#include "wire/service_path.h"

namespace quorvel::platform::host {

namespace {

// A new client waits behind everybody in the queue, those who have left again included, so a longer queue lets clients
// that come and go in a loop delay the others for longer. Whom it does not hold tries again.
constexpr int kBacklog = 256;

// The socket is made under this suffix and renamed when it is ready.
constexpr std::string_view kUnfinishedSuffix = ".new";

struct LocalAddress {
  sockaddr_un address = {};
  socklen_t length = 0;
  [[nodiscard]] const sockaddr* get() const noexcept { return reinterpret_cast<const sockaddr*>(&address); }
};

// The address of an open object, or with a name, of an entry of an open directory.
[[nodiscard]] bool make_address(int descriptor, std::string_view name, LocalAddress& out) noexcept {
  out.address.sun_family = AF_UNIX;
  const int length = std::snprintf(out.address.sun_path, sizeof out.address.sun_path, "/proc/self/fd/%d%s%.*s",
                                   descriptor, name.empty() ? "" : "/", static_cast<int>(name.size()), name.data());
  if (length < 0 || static_cast<std::size_t>(length) >= sizeof out.address.sun_path) {
    errno = ENAMETOOLONG;
    return false;
  }
  out.length = static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + static_cast<std::size_t>(length) + 1);
  return true;
}

[[nodiscard]] Descriptor make_socket() noexcept {
  return Descriptor(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
}

// Settles whether `name` is free for a new socket: nothing stands there, or a socket that nobody listens on any more.
[[nodiscard]] bool may_replace(int directory, const char* name) noexcept {
  struct stat status;
  if (::fstatat(directory, name, &status, AT_SYMLINK_NOFOLLOW) != 0) return errno == ENOENT;
  if (!S_ISSOCK(status.st_mode)) {
    errno = EEXIST;
    return false;
  }
  if (connect_local(name)) {
    errno = EADDRINUSE;
    return false;
  }
  if (errno == ECONNREFUSED || errno == ENOENT) return true;
  // A full queue, or a socket of another type, has a live owner as well.
  if (errno == EAGAIN || errno == EPROTOTYPE) errno = EADDRINUSE;
  return false;
}

}  // namespace

Descriptor open_service_directory() noexcept {
  char path[wire::kServiceDirectory.size() + 1] = {};
  std::memcpy(path, wire::kServiceDirectory.data(), wire::kServiceDirectory.size());
  return Descriptor(open_file(path, O_PATH | O_DIRECTORY, 0));
}

// The socket itself is opened for its address: a link in its place is then taken inside the device root.
Descriptor connect_local(std::string_view name) noexcept {
  char path[kPathSize];
  const int length = std::snprintf(path, sizeof path, "%.*s/%.*s", static_cast<int>(wire::kServiceDirectory.size()),
                                   wire::kServiceDirectory.data(), static_cast<int>(name.size()), name.data());
  if (length < 0 || static_cast<std::size_t>(length) >= sizeof path) {
    errno = ENAMETOOLONG;
    return Descriptor();
  }
  const Descriptor file(open_file(path, O_PATH, 0));
  LocalAddress address;
  if (!file || !make_address(file.get(), "", address)) return Descriptor();
  Descriptor socket = make_socket();
  if (!socket) return socket;
  int result = ::connect(socket.get(), address.get(), address.length);
  while (result != 0 && errno == EINTR) result = ::connect(socket.get(), address.get(), address.length);
  return result == 0 || errno == EISCONN ? std::move(socket) : Descriptor();
}

bool is_served(std::string_view name) noexcept { return connect_local(name) || errno == EAGAIN; }

ListeningSocket& ListeningSocket::operator=(ListeningSocket&& other) noexcept {
  std::swap(socket_, other.socket_);
  std::swap(directory_, other.directory_);
  std::swap(name_, other.name_);
  std::swap(device_, other.device_);
  std::swap(inode_, other.inode_);
  return *this;
}

bool ListeningSocket::bind_and_listen(std::string_view name, mode_t mode) noexcept {
  char unfinished[kNameSize];
  const int length = std::snprintf(unfinished, sizeof unfinished, "%.*s%s", static_cast<int>(name.size()), name.data(),
                                   kUnfinishedSuffix.data());
  LocalAddress address;
  if (length < 0 || !make_address(directory_.get(), unfinished, address)) return false;
  if (!may_replace(directory_.get(), unfinished)) return false;
  ::unlinkat(directory_.get(), unfinished, 0);
  if (::bind(socket_.get(), address.get(), address.length) != 0) return false;
  refuse_attached_descriptors(socket_.get());
  struct stat status;
  // A service that runs as root serves the directory's owner.
  const bool is_the_owners =
      ::geteuid() != 0 || (::fstat(directory_.get(), &status) == 0 &&
                           (status.st_uid == 0 || ::fchownat(directory_.get(), unfinished, status.st_uid, status.st_gid,
                                                             AT_SYMLINK_NOFOLLOW) == 0));
  // Nobody can connect before the mode is set, because nobody listens yet; renaming then puts the file in its place
  // ready for use, and in place of a stale one at the same moment.
  if (!is_the_owners || ::fchmodat(directory_.get(), unfinished, mode, 0) != 0 ||
      ::fstatat(directory_.get(), unfinished, &status, AT_SYMLINK_NOFOLLOW) != 0 ||
      ::listen(socket_.get(), kBacklog) != 0 ||
      ::renameat(directory_.get(), unfinished, directory_.get(), name_) != 0) {
    const int error = errno;
    ::unlinkat(directory_.get(), unfinished, 0);
    errno = error;
    return false;
  }
  device_ = status.st_dev;
  inode_ = status.st_ino;
  return true;
}

ListeningSocket ListeningSocket::open(std::string_view name, mode_t mode) noexcept {
  ListeningSocket result;
  if (name.empty() || name.size() >= kNameSize || name.find('/') != std::string_view::npos) {
    errno = ENAMETOOLONG;
    return result;
  }
  std::memcpy(result.name_, name.data(), name.size());
  result.directory_ = open_service_directory();
  if (result.directory_ && may_replace(result.directory_.get(), result.name_)) {
    result.socket_ = make_socket();
    if (result.socket_ && result.bind_and_listen(name, mode)) return result;
  }
  result.name_[0] = '\0';
  result.socket_ = Descriptor();
  return result;
}

void ListeningSocket::remove_file() noexcept {
  if (!directory_ || name_[0] == '\0') return;
  struct stat status;
  if (::fstatat(directory_.get(), name_, &status, AT_SYMLINK_NOFOLLOW) == 0 && status.st_dev == device_ &&
      status.st_ino == inode_) {
    ::unlinkat(directory_.get(), name_, 0);
  }
  name_[0] = '\0';
}

}  // namespace quorvel::platform::host
