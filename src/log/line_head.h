// The head of a log line: time stamp, process id and thread handle.
#pragma once

#include <string_view>

namespace quorvel {

/// "STAMP pid=N (0xHANDLE) " for the calling thread, now. The text belongs to the thread and lasts until its next call:
/// a head changes once a second, so a thread keeps its own.
[[nodiscard]] std::string_view line_head() noexcept;

}  // namespace quorvel
