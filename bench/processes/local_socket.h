// Stream sockets on this machine. Everything throws when a call fails.
#pragma once

#include <filesystem>

#include "platform/descriptor.h"

namespace quorvel::bench {

/// Not blocking.
[[nodiscard]] Descriptor listen_on(const std::filesystem::path& path);
/// Blocking. Waits up to two seconds for a server that has just been started.
[[nodiscard]] Descriptor connect_to(const std::filesystem::path& path);

}  // namespace quorvel::bench
