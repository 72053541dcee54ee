// The device's file system: every path is absolute, canonical or not, and is resolved inside the device root as if the
// process had been chrooted there. An open descriptor is plain POSIX. Interrupted calls are retried. Failures are
// reported in errno. Any thread may call everything here.
#pragma once

#include <fcntl.h>
#include <sys/stat.h>

#include <cstddef>

namespace quorvel::platform {

/// Longest path that the daemon handles, terminator included.
inline constexpr std::size_t kPathSize = 1024;

/// Opens `path` as open(2) does, with O_CLOEXEC and O_NOCTTY added. Returns a descriptor that the caller closes, or -1.
[[nodiscard]] int open_file(const char* path, int flags, mode_t mode) noexcept;

/// The descriptor-path query: writes the absolute path of the open object, every symbolic link resolved, as seen from
/// the device root. The name is the one the object had when it was opened if it has been replaced or removed since.
/// Returns 0, or -1 (ENAMETOOLONG when the path and its terminator exceed `size`: a cut path is never reported).
[[nodiscard]] int descriptor_path(int descriptor, char* path, std::size_t size) noexcept;

/// stat(2): follows symbolic links. Returns 0 or -1.
[[nodiscard]] int file_status(const char* path, struct stat* status) noexcept;

/// mkdir(2), unlink(2), rename(2). Each returns 0 or -1.
[[nodiscard]] int make_directory(const char* path, mode_t mode) noexcept;
int remove_file(const char* path) noexcept;
[[nodiscard]] int rename_file(const char* from, const char* to) noexcept;

/// Brings an open file's content, or a directory's entries, to stable storage. Each returns 0 or -1.
[[nodiscard]] int flush_file(int descriptor) noexcept;
[[nodiscard]] int flush_directory(const char* path) noexcept;

}  // namespace quorvel::platform
