#include <fcntl.h>
#include <malloc.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sysexits.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <climits>
#include <csignal>
#include <cstdio>
#include <cstdlib>

#include "linux/base/device_root.h"
#include "linux/base/error_line.h"
#include "linux/base/local_socket.h"
#include "linux/notifications/notification_server.h"
#include "linux/process/instance_lock.h"
#include "linux/process/run_loop_source.h"
#include "linux/process/service_manager.h"
#include "platform/process.h"
#include "wire/service_path.h"

namespace quorvel::platform {

namespace {

constexpr rlim_t kMaximumDescriptors = 65536;
constexpr rlim_t kFewestDescriptors = 40;

// A file that took the number of a closed standard descriptor would receive what is written to it.
[[nodiscard]] bool fill_standard_descriptors() noexcept {
  int descriptor = -1;
  do {
    descriptor = ::open("/dev/null", O_RDWR);
    if (descriptor < 0) return false;
  } while (descriptor <= STDERR_FILENO);
  ::close(descriptor);
  return true;
}

// A peer that goes away and a file that reaches its size limit are errors to be handled, not reasons to die, and the
// end of the terminal that the daemon was started from is none of its business.
void ignore_fatal_signals() noexcept {
  struct sigaction ignore = {};
  ignore.sa_handler = SIG_IGN;
  ::sigaction(SIGPIPE, &ignore, nullptr);
  ::sigaction(SIGXFSZ, &ignore, nullptr);
  ::sigaction(SIGHUP, &ignore, nullptr);
}

// Raises the limit on descriptors as far as it goes. False, and a line on standard error, where even that is too few to
// serve a client and read a file for it.
[[nodiscard]] bool has_enough_descriptors() noexcept {
  rlimit limit;
  if (::getrlimit(RLIMIT_NOFILE, &limit) != 0) return true;
  const rlim_t wanted = std::min(limit.rlim_max, kMaximumDescriptors);
  if (limit.rlim_cur < wanted) {
    limit.rlim_cur = wanted;
    ::setrlimit(RLIMIT_NOFILE, &limit);
  }
  if (limit.rlim_cur >= kFewestDescriptors) return true;
  host::print_error_line("a limit of %llu descriptors is too low, %llu are needed",
                         static_cast<unsigned long long>(limit.rlim_cur),
                         static_cast<unsigned long long>(kFewestDescriptors));
  return false;
}

// 0, or after a line on standard error the exit status to end with.
[[nodiscard]] int settle_root() noexcept {
  if (::access("/proc/self/fd", X_OK) != 0) {
    host::print_system_error("/proc/self/fd, which every path is checked with, cannot be used");
    return EX_OSERR;
  }
  const host::DeviceRoot& root = host::device_root();
  if (root.error == 0) return 0;
  if (root.error == ENOSYS) {
    host::print_error_line("QUORVEL_ROOT needs Linux 5.6 or later; unset, quorveld runs on this one as well");
  } else {
    errno = root.error;
    const char* value = std::getenv("QUORVEL_ROOT");
    host::print_system_error("QUORVEL_ROOT must be the absolute path of a directory, which \"%s\" is not",
                             value != nullptr ? value : "/");
  }
  return EX_CONFIG;
}

// A block of half a MiB or more is given back to the system when it is freed. The allocator would otherwise learn from
// the first one to keep such blocks, in every thread. Values of many small blocks are another matter: the IPC service
// has the allocator look for free pages behind a large one.
void bound_idle_memory() noexcept {
  ::mallopt(M_MMAP_THRESHOLD, 512 << 10);
  ::mallopt(M_TRIM_THRESHOLD, 1 << 20);
}

// Somebody may hold the service's socket without the lock. A socket that the service manager passed is live, and ours.
[[nodiscard]] int refuse_served_socket(std::string_view service_name) noexcept {
  if (service_name.empty() || host::has_passed_socket()) return 0;
  char name[NAME_MAX + 1];
  const int length = std::snprintf(name, sizeof name, "%.*s%s", static_cast<int>(service_name.size()),
                                   service_name.data(), wire::kSocketSuffix.data());
  if (length < 0 || !host::is_served(name)) return 0;
  host::print_error_line("another process serves %s/%s", wire::kServiceDirectory.data(), name);
  return EX_UNAVAILABLE;
}

}  // namespace

int start_process(std::string_view service_name) noexcept {
  host::settle_passed_sockets();
  ignore_fatal_signals();
  if (!fill_standard_descriptors()) {
    host::print_system_error("cannot open /dev/null");
    return EX_OSERR;
  }
  // From here on a signal that ends the daemon waits until the run loop takes it.
  if (!main_run_loop()->open()) {
    host::print_system_error("cannot make the run loop");
    return EX_OSERR;
  }
  if (!has_enough_descriptors()) return EX_OSERR;
  if (const int status = settle_root(); status != 0) return status;
  ::umask(022);
  bound_idle_memory();
  // The socket is asked about first: the lock of another user's instance cannot even be opened.
  int status = refuse_served_socket(service_name);
  if (status == 0) status = host::take_instance_lock();
  if (status == 0) host::start_notification_server();
  return status;
}

void end_process(const char* reason, int status) noexcept {
  host::print_error_line("%s", reason);
  ::_exit(status);
}

}  // namespace quorvel::platform
