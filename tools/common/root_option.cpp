#include "root_option.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>
#include <filesystem>
#include <system_error>

#include "failure.h"
#include "platform/descriptor.h"
#include "platform/file_system.h"

namespace quorvel::tools {
namespace {

constexpr int kBadConfiguration = 78;

}  // namespace

void use_device_root(const std::optional<std::string>& directory, int status) {
  if (directory) {
    std::error_code error;
    const std::filesystem::path path = std::filesystem::absolute(*directory, error);
    if (error || ::setenv("QUORVEL_ROOT", path.c_str(), 1) != 0) {
      throw Failure{status, "--root \"" + *directory + "\" cannot be used: " + error.message()};
    }
  }
  if (Descriptor(platform::open_file("/", O_PATH | O_DIRECTORY, 0))) return;
  const int error = errno;
  if (error == ENOSYS) throw Failure{directory ? status : kBadConfiguration, "A device root needs Linux 5.6 or later"};
  // Every path in a device root is checked through /proc, which may be what is missing.
  if (::access("/proc/self/fd", X_OK) != 0) {
    throw Failure{directory ? status : kBadConfiguration, "A device root needs /proc, which cannot be used"};
  }
  const std::string reason = std::strerror(error);
  if (directory) {
    throw Failure{status, "--root \"" + *directory + "\": " + reason +
                              ". Make a device root with: quorvelctl root create " + *directory};
  }
  const char* value = std::getenv("QUORVEL_ROOT");
  throw Failure{kBadConfiguration, std::string("QUORVEL_ROOT is \"") + (value != nullptr ? value : "") +
                                       "\": " + reason + ". Set it to the absolute path of a directory, or unset it"};
}

}  // namespace quorvel::tools
