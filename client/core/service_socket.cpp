#include "client/core/service_socket.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "wire/service_path.h"

namespace quorvel::client {
namespace {

ErrorCode code_of(int error) noexcept {
  switch (error) {
    case ENOENT:
    case ENOTDIR:
    case ECONNREFUSED:
    case ENOTSOCK: return ErrorCode::service_absent;
    case EACCES:
    case EPERM: return ErrorCode::access_denied;
    default: return ErrorCode::system_failure;
  }
}

// Why a root cannot be opened: for want of descriptors or memory, or because it is none.
ErrorCode root_code_of(int error) noexcept {
  return error == EMFILE || error == ENFILE || error == ENOMEM ? ErrorCode::system_failure : ErrorCode::invalid_root;
}

}  // namespace

bool ServiceSocket::open_root(const char* root, Failure& failure) noexcept {
  if (root == nullptr) root = std::getenv("QUORVEL_ROOT");
  if (root == nullptr) root = "/";
  is_machine_ = std::strcmp(root, "/") == 0;
  errno = EINVAL;
  root_ = Descriptor(*root == '/' ? ::open(root, O_PATH | O_DIRECTORY | O_CLOEXEC) : -1);
  if (root_) return true;
  const int error = errno;
  set_system_failure(failure, root_code_of(error), {"The device root \"", root, "\" cannot be used"}, error);
  return false;
}

bool ServiceSocket::open(const char* root, std::string_view service, Failure& failure) noexcept {
  if (!open_root(root, failure)) return false;
  const std::size_t length = wire::kServiceDirectory.size() + 1 + service.size() + wire::kSocketSuffix.size();
  if (service.empty() || length >= kPathSize || service.find('/') != std::string_view::npos ||
      service.find('\0') != std::string_view::npos) {
    set_failure(failure, ErrorCode::invalid_argument, {"\"", service, "\" cannot be the name of a service."});
    return false;
  }
  std::snprintf(path_, sizeof path_, "%s/%.*s%s", wire::kServiceDirectory.data(), static_cast<int>(service.size()),
                service.data(), wire::kSocketSuffix.data());
  socket_ = Descriptor(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (!socket_) set_system_failure(failure, ErrorCode::system_failure, {"No socket can be had"}, errno);
  return static_cast<bool>(socket_);
}

ServiceSocket::Step ServiceSocket::connect(Failure& failure) noexcept {
  int error;
  do {
    error = connect_in_root();
  } while (error == EINTR);
  if (error == EAGAIN) return Step::busy;
  root_ = Descriptor();
  if (error == 0) return Step::connected;
  if (error == ENOSYS) {
    set_failure(failure, ErrorCode::system_failure, {"A device root needs Linux 5.6 or later."});
    return Step::failed;
  }
  set_system_failure(failure, code_of(error), {"Cannot connect to ", path_, " in the device root"}, error);
  return Step::failed;
}

// The machine's own root needs no resolving, and so no kernel that can.
Descriptor ServiceSocket::open_in_root() const noexcept {
  if (is_machine_) return Descriptor(::open(path_, O_PATH | O_CLOEXEC));
  open_how how{};
  how.flags = O_PATH | O_CLOEXEC;
  how.resolve = RESOLVE_IN_ROOT;
  long descriptor;
  do {
    descriptor = ::syscall(SYS_openat2, root_.get(), path_, &how, sizeof how);
  } while (descriptor < 0 && (errno == EINTR || errno == EAGAIN));
  return Descriptor(static_cast<int>(descriptor));
}

// The address goes through the descriptor of the socket itself: no root path is too long for that, and a link in the
// socket's place is taken inside the root.
int ServiceSocket::connect_in_root() const noexcept {
  const Descriptor file = open_in_root();
  if (!file) return errno;
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::snprintf(address.sun_path, sizeof address.sun_path, "/proc/self/fd/%d", file.get());
  return ::connect(socket_.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0 ? 0 : errno;
}

}  // namespace quorvel::client
