// The device root as the words of a call choose it.
#pragma once

#include <optional>
#include <string>

namespace quorvel::tools {

inline constexpr const char* kRootHelp = "Directory that stands for the device's / (default: QUORVEL_ROOT, else /)";

/// Has everything that follows look into `directory` (may be relative), or without one, into what QUORVEL_ROOT names.
/// Before the first use of the device's files. Throws Failure when that is no directory, with `status` for `directory`
/// and 78 for QUORVEL_ROOT.
void use_device_root(const std::optional<std::string>& directory, int status);

}  // namespace quorvel::tools
