#pragma once

#include <chrono>
#include <functional>

namespace quorvel::test {

/// How long a test waits for something that should happen at once. Long, because a loaded machine or a sanitizer slows
/// everything down; a test that passes never waits it out.
inline constexpr std::chrono::milliseconds kPatience{20'000};

/// Asks `condition` every few milliseconds until it holds; false when it does not within `patience`.
[[nodiscard]] bool eventually(const std::function<bool()>& condition, std::chrono::milliseconds patience = kPatience);

}  // namespace quorvel::test
