#include <cstring>

#include "files/error_text.h"
#include "files/safe_open.h"
#include "log/daemon_log.h"
#include "platform/file_system.h"

namespace quorvel {

void log_file_info(const char* path) noexcept {
  struct stat status;
  if (platform::file_status(path, &status) != 0) {
    const ErrorText error;
    daemon_log(0, "log_file_info", "Can't stat %s: %s", path, error.text());
    return;
  }
  daemon_log(0, "log_file_info", "stat %s uid=%d gid=%d p=%o", path, static_cast<int>(status.st_uid),
             static_cast<int>(status.st_gid), static_cast<unsigned>(status.st_mode));
}

void log_file_and_dir_info(const char* path) noexcept {
  const ErrorText callers_error;
  log_file_info(path);
  char directory[1024 + 1];
  const std::size_t length = ::strnlen(path, sizeof directory - 1);
  std::memcpy(directory, path, length);
  directory[length] = '\0';
  log_file_info(dirname_in_place(directory));
}

char* dirname_in_place(char* buffer) noexcept {
  if (buffer == nullptr || *buffer == '\0') return buffer;
  char* at = buffer + std::strlen(buffer) - 1;
  while (at > buffer && *at == '/') --at;
  while (at > buffer && *at != '/') --at;
  if (at == buffer) {
    if (*buffer != '/') *buffer = '.';
    buffer[1] = '\0';
    return buffer;
  }
  while (at > buffer && *at == '/') --at;
  at[1] = '\0';
  return buffer;
}

}  // namespace quorvel
