#pragma once

#include "support/prelude.h"

namespace quorvel::test {

/// How long a test waits for something that should happen at once. Long, because a loaded machine or a sanitizer slows
/// everything down; a test that passes never waits it out.
inline constexpr std::chrono::milliseconds kPatience{20'000};

/// Asks `condition` every few milliseconds until it holds; false when it does not within `patience`.
[[nodiscard]] bool eventually(const std::function<bool()>& condition, std::chrono::milliseconds patience = kPatience);

/// How many descriptors this process, or process `pid`, has open.
[[nodiscard]] std::size_t descriptors_open();
[[nodiscard]] std::size_t descriptors_open(pid_t pid);

}  // namespace quorvel::test
