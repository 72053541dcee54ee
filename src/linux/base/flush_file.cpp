#include "platform/flush_file.h"

#include <unistd.h>

#include <cerrno>

namespace quorvel::platform {

int flush_file(int descriptor) noexcept {
  int result = ::fdatasync(descriptor);
  while (result != 0 && errno == EINTR) result = ::fdatasync(descriptor);
  return result;
}

}  // namespace quorvel::platform
