// Standard error, which nobody ever waits for.
#pragma once

#include <string_view>

namespace quorvel::platform {

/// Writes `text` to standard error when it takes it at once; a pipe or terminal that is full loses it. Leaves errno as
/// it was. Any thread.
void write_error_output(std::string_view text) noexcept;

}  // namespace quorvel::platform
