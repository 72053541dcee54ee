#pragma once

namespace quorvel::platform::host {

/// Sets the name that the lines begin with, a text that lives as long as the process; "quorveld" without. Main thread,
/// before there are others.
void name_error_lines(const char* program) noexcept;

/// Writes one line on standard error: the program's name, then the text, printf-style. Control characters are replaced,
/// so that it stays one line. Leaves errno as it was. Any thread.
[[gnu::format(printf, 1, 2)]] void print_error_line(const char* format, ...) noexcept;

/// The same with the text of the present error number behind a colon.
[[gnu::format(printf, 1, 2)]] void print_system_error(const char* format, ...) noexcept;

}  // namespace quorvel::platform::host
