// The log file: opened on first use, kept open, rotated when it is full.
#pragma once

#include <cstdint>

namespace quorvel {

inline constexpr std::int64_t kRotationThreshold = 1'048'576;

/// Appends one finished line, its newline included, under the log lock, opening the file first when it is closed and
/// rotating it afterwards when it is full. A line that cannot be written is lost. Any thread that does not hold the log
/// lock.
void log_write_line(const char* line) noexcept;

/// Whether the latest line of any thread was written. Any thread.
[[nodiscard]] bool log_took_last_line() noexcept;

/// Moves a file that has reached the threshold to its previous generation, "PATH.1". Returns 1 when it did, which
/// failures to remove or rename do not change, and 0 below the threshold. With the log lock held.
int log_rotate_if_needed(const char* path, std::int64_t count) noexcept;

}  // namespace quorvel
