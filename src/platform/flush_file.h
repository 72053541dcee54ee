#pragma once

namespace quorvel::platform {

/// Brings an open file's content to stable storage. Returns 0, or -1 with errno set. Any thread.
[[nodiscard]] int flush_file(int descriptor) noexcept;

}  // namespace quorvel::platform
