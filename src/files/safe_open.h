// Opens that make sure the object opened is exactly the object named: not a symbolic link, opened under the very path
// that the caller gave, and of the type the caller expects. Any thread may call everything here.
#pragma once

#include <sys/stat.h>

namespace quorvel {

inline constexpr mode_t kFileTypeMask = 0xF000;
inline constexpr mode_t kRegularFile = 0x8000;
inline constexpr mode_t kDirectory = 0x4000;

/// Opens `path` with `flags` (O_NOFOLLOW is added) and the creation mode `mode`. Returns a descriptor that the caller
/// closes, or -1 after logging why; the error number is that of the failed call, and of no meaning after a refusal of
/// the path or type. A file that is to be truncated loses its content only once it has passed every check.
[[nodiscard]] int _safe_open(const char* path, int flags, mode_t mode, mode_t expected_type) noexcept;

/// `_safe_open` for callers that must not create anything: O_CREAT in `flags` is refused with EINVAL.
[[nodiscard]] int safe_open(const char* path, int flags, mode_t expected_type) noexcept;

/// Logs the owner, group and mode of `path`, links followed, or why they cannot be had.
void log_file_info(const char* path) noexcept;

/// `log_file_info` for `path` and for its parent directory. Leaves errno as it was.
void log_file_and_dir_info(const char* path) noexcept;

/// Reduces a path to its parent directory in its own buffer, which must hold two bytes at least, and returns it. Null
/// and the empty text come back unchanged.
char* dirname_in_place(char* buffer) noexcept;

}  // namespace quorvel
