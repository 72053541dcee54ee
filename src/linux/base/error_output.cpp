#include "platform/error_output.h"

#include <poll.h>
#include <sys/stat.h>
#include <sys/uio.h>
#include <unistd.h>

#include <cerrno>

namespace quorvel::platform {

namespace {

// A regular file never waits for a reader. Everything else is asked not to wait with the write itself, since whoever
// shares a pipe may fill it at any time; where the kernel cannot be asked so, it has to have room before.
void write_without_waiting(std::string_view text) noexcept {
  struct stat status;
  if (::fstat(STDERR_FILENO, &status) != 0 || !S_ISREG(status.st_mode)) {
    const iovec part{const_cast<char*>(text.data()), text.size()};
    if (::pwritev2(STDERR_FILENO, &part, 1, -1, RWF_NOWAIT) >= 0) return;
    if (errno != EOPNOTSUPP && errno != ENOSYS) return;
    pollfd output{STDERR_FILENO, POLLOUT, 0};
    if (::poll(&output, 1, 0) != 1 || (output.revents & POLLOUT) == 0) return;
  }
  [[maybe_unused]] const ssize_t written = ::write(STDERR_FILENO, text.data(), text.size());
}

}  // namespace

void write_error_output(std::string_view text) noexcept {
  const int error = errno;
  write_without_waiting(text);
  errno = error;
}

}  // namespace quorvel::platform
