// What the log writer itself cannot do: it cannot go to the log, so it goes to standard error.
#pragma once

namespace quorvel {

/// Reports a failed call on the log file, as "_safe_open: WHAT(PATH) failed: ERROR" with the text of errno, at most
/// once a minute; reports between are counted and the next one tells how many. With the log lock held.
void report_log_trouble(const char* what, const char* path) noexcept;

/// The same for a log file of the wrong type.
void report_log_type(const char* path, unsigned found, unsigned expected) noexcept;

}  // namespace quorvel
