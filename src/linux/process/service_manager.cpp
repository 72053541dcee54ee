#include "linux/process/service_manager.h"

#include <fcntl.h>
#include <sys/socket.h>
#include <sys/time.h>
#include <sys/un.h>

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <cstddef>
#include <cstdio>
#include <cstdlib>
#include <cstring>
#include <optional>
#include <string_view>
#include <utility>

#include "linux/base/error_line.h"
#include "platform/process.h"

namespace quorvel::platform {

namespace {

constexpr int kFirstPassedDescriptor = 3;
constexpr int kMaximumPassedDescriptors = 1024;

// The number that an environment variable's value is; none for a variable that is not set or holds something else.
[[nodiscard]] std::optional<int> number_in(const char* value) noexcept {
  if (value == nullptr) return std::nullopt;
  const char* end = value + std::strlen(value);
  int number = 0;
  const auto [stop, error] = std::from_chars(value, end, number);
  if (error != std::errc() || stop != end) return std::nullopt;
  return number;
}

[[nodiscard]] bool has_socket_option(int descriptor, int option, int expected) noexcept {
  int value = 0;
  socklen_t length = sizeof value;
  return ::getsockopt(descriptor, SOL_SOCKET, option, &value, &length) == 0 && value == expected;
}

// The passed descriptor that clients are accepted from, or -1. Settled before the daemon opens anything of its own.
constinit int passed_socket = -1;

// Sorts the passed descriptors by what they can be used for.
struct Passed {
  int missing = 0;     // not open at all
  int foreign = 0;     // no local stream socket
  int unlistened = 0;  // one that does not listen
  int usable = 0;

  void count(int descriptor) noexcept {
    if (::fcntl(descriptor, F_GETFD) < 0) {
      ++missing;
    } else if (!has_socket_option(descriptor, SO_DOMAIN, AF_UNIX) ||
               !has_socket_option(descriptor, SO_TYPE, SOCK_STREAM)) {
      ++foreign;
    } else if (!has_socket_option(descriptor, SO_ACCEPTCONN, 1)) {
      ++unlistened;
    } else if (usable++ == 0) {
      passed_socket = descriptor;
    }
  }

  // One sentence for each kind of trouble. The start goes on with what is left, or with a socket of its own.
  void tell_troubles() const noexcept {
    const auto tell = [](int number, const char* trouble) {
      if (number > 0) host::print_error_line("passed descriptors (LISTEN_FDS) that %s: %d", trouble, number);
    };
    tell(missing, "are not open");
    tell(foreign, "are no local stream sockets");
    tell(unlistened, "do not listen");
    tell(usable - 1, "could be served beside the first, which alone is");
  }
};

[[nodiscard]] bool send_to_manager(std::string_view socket_name, std::string_view message, int flags) noexcept {
  sockaddr_un address = {};
  address.sun_family = AF_UNIX;
  // An abstract name starts with a zero byte and ends where the address does, without one.
  const bool is_abstract = socket_name.starts_with('@');
  if (socket_name.size() < 2 || socket_name.size() + (is_abstract ? 0 : 1) > sizeof address.sun_path) {
    errno = EINVAL;
    return false;
  }
  std::memcpy(address.sun_path, socket_name.data(), socket_name.size());
  if (is_abstract) address.sun_path[0] = '\0';
  const auto length =
      static_cast<socklen_t>(offsetof(sockaddr_un, sun_path) + socket_name.size() + (is_abstract ? 0 : 1));
  const Descriptor socket(::socket(AF_UNIX, SOCK_DGRAM | SOCK_CLOEXEC, 0));
  if (!socket) return false;
  // A manager that is behind with its messages gets a moment, because it waits for this one.
  const timeval patience = {1, 0};
  ::setsockopt(socket.get(), SOL_SOCKET, SO_SNDTIMEO, &patience, sizeof patience);
  ssize_t sent = -1;
  do {
    sent = ::sendto(socket.get(), message.data(), message.size(), MSG_NOSIGNAL | flags,
                    reinterpret_cast<const sockaddr*>(&address), length);
  } while (sent < 0 && errno == EINTR);
  return sent >= 0;
}

void tell_manager(std::string_view message, int flags) noexcept {
  const char* name = std::getenv("NOTIFY_SOCKET");
  if (name == nullptr || name[0] == '\0') return;
  if (!send_to_manager(name, message, flags) && errno != EAGAIN)
    host::print_system_error("cannot tell the service manager at %s", name);
}

}  // namespace

void host::settle_passed_sockets() noexcept {
  if (number_in(std::getenv("LISTEN_PID")) != ::getpid()) return;
  const char* value = std::getenv("LISTEN_FDS");
  const int announced = number_in(value).value_or(-1);
  if (announced < 0 || announced > kMaximumPassedDescriptors) {
    print_error_line("LISTEN_FDS is \"%s\", but takes a number of passed descriptors, %d at most",
                     value != nullptr ? value : "", kMaximumPassedDescriptors);
  }
  Passed passed;
  const int count = std::clamp(announced, 0, kMaximumPassedDescriptors);
  for (int i = 0; i < count; ++i) passed.count(kFirstPassedDescriptor + i);
  passed.tell_troubles();
}

bool host::has_passed_socket() noexcept { return passed_socket >= 0; }

Descriptor host::take_passed_socket() noexcept {
  const int descriptor = std::exchange(passed_socket, -1);
  if (descriptor < 0) return Descriptor();
  ::fcntl(descriptor, F_SETFD, FD_CLOEXEC);
  const int flags = ::fcntl(descriptor, F_GETFL);
  if (flags < 0 || ::fcntl(descriptor, F_SETFL, flags | O_NONBLOCK) != 0) return Descriptor();
  return Descriptor(descriptor);
}

void host::report_status(std::string_view text) noexcept {
  char message[256];
  text = text.substr(0, text.find('\n'));
  const int length = std::snprintf(message, sizeof message, "STATUS=%.*s", static_cast<int>(text.size()), text.data());
  if (length > 0) tell_manager({message, std::min(static_cast<std::size_t>(length), sizeof message - 1)}, MSG_DONTWAIT);
}

void report_ready() noexcept { tell_manager("READY=1", 0); }

}  // namespace quorvel::platform
