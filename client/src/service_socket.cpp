#include "service_socket.h"

#include <fcntl.h>
#include <linux/openat2.h>
#include <poll.h>
#include <sys/socket.h>
#include <sys/syscall.h>
#include <sys/un.h>
#include <unistd.h>

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstdlib>
#include <cstring>

#include "wire/service_path.h"

namespace quorvel::client {
namespace {

constexpr std::chrono::milliseconds kFullBacklogPause{1};
// No service can listen under a longer name: its socket address would not hold it.
constexpr std::size_t kLongestName = 80;

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

Error failure(ErrorCode code, const std::string& what, int error) {
  return {code, 0, what + ": " + std::strerror(error)};
}

Descriptor open_in_root(const Descriptor& root, const std::string& path) noexcept {
  open_how how{};
  how.flags = O_PATH | O_CLOEXEC;
  how.resolve = RESOLVE_IN_ROOT;
  long descriptor;
  do {
    descriptor = ::syscall(SYS_openat2, root.get(), path.c_str(), &how, sizeof how);
  } while (descriptor < 0 && (errno == EINTR || errno == EAGAIN));
  return Descriptor(static_cast<int>(descriptor));
}

Descriptor open_root(const std::string& given_root, std::optional<Error>& error) {
  std::string root = given_root;
  if (root.empty()) {
    const char* environment = std::getenv("QUORVEL_ROOT");
    root = environment != nullptr ? environment : "/";
  }
  Descriptor directory(root.starts_with('/') ? ::open(root.c_str(), O_PATH | O_DIRECTORY | O_CLOEXEC) : -1);
  if (!directory) {
    const int reason = root.starts_with('/') ? errno : EINVAL;
    error = failure(ErrorCode::invalid_root, "The device root \"" + root + "\" cannot be used", reason);
  }
  return directory;
}

// Connects to the socket at `path`, or returns why not. The address goes through the descriptor of the socket itself:
// no root path is too long for that, and a link in the socket's place is taken inside the root.
int connect_in_root(const Descriptor& connection, const Descriptor& root, const std::string& path) noexcept {
  const Descriptor file = open_in_root(root, path);
  if (!file) return errno;
  sockaddr_un address{};
  address.sun_family = AF_UNIX;
  std::snprintf(address.sun_path, sizeof address.sun_path, "/proc/self/fd/%d", file.get());
  return ::connect(connection.get(), reinterpret_cast<const sockaddr*>(&address), sizeof address) == 0 ? 0 : errno;
}

}  // namespace

Deadline deadline_after(std::chrono::milliseconds timeout) noexcept {
  const Deadline now = std::chrono::steady_clock::now();
  if (timeout.count() < 0 || timeout >= std::chrono::duration_cast<std::chrono::milliseconds>(kNever - now)) {
    return kNever;
  }
  return now + timeout;
}

bool wait_until_ready(int descriptor, short events, Deadline deadline) noexcept {
  pollfd wait{descriptor, events, 0};
  for (;;) {
    int milliseconds = -1;
    if (deadline != kNever) {
      const auto left = std::chrono::ceil<std::chrono::milliseconds>(deadline - std::chrono::steady_clock::now());
      if (left.count() <= 0) return false;
      milliseconds = left.count() > INT_MAX ? INT_MAX : static_cast<int>(left.count());
    }
    if (::poll(&wait, 1, milliseconds) > 0) return true;
  }
}

Descriptor connect_to_service(const std::string& root, const std::string& socket, Deadline deadline,
                              std::optional<Error>& error) {
  const Descriptor directory = open_root(root, error);
  if (!directory) return {};
  if (socket.size() > kLongestName || socket.find('/') != std::string::npos) {
    error = Error{ErrorCode::invalid_argument, 0, "\"" + socket + "\" cannot be the name of a service's socket."};
    return {};
  }
  Descriptor connection(::socket(AF_UNIX, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0));
  if (!connection) {
    error = failure(ErrorCode::system_failure, "No socket can be had", errno);
    return {};
  }
  const std::string path = std::string(wire::kServiceDirectory) + '/' + socket;
  while (const int reason = connect_in_root(connection, directory, path)) {
    // A service with a full backlog is there, only busy; a socket of this kind cannot be waited for.
    if (reason != EAGAIN && reason != EINTR) {
      error = failure(code_of(reason), "Cannot connect to \"" + socket + "\"", reason);
      return {};
    }
    if (std::chrono::steady_clock::now() >= deadline) {
      error = Error{ErrorCode::timed_out, 0, "The service behind \"" + socket + "\" takes no connections in time."};
      return {};
    }
    if (reason == EAGAIN) std::this_thread::sleep_for(kFullBacklogPause);
  }
  return connection;
}

}  // namespace quorvel::client
