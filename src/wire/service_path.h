// Which socket stands for which service, as seen from the device root.
#pragma once

#include <string_view>

#include "platform/device_paths.h"

namespace quorvel::wire {

inline constexpr std::string_view kServiceDirectory = paths::kServiceDirectory;
/// A service's socket is named after the service, with this suffix.
inline constexpr std::string_view kSocketSuffix = ".sock";
inline constexpr std::string_view kNotificationSocket = "notifications.sock";
inline constexpr std::string_view kTelephonySocket = {paths::kTelephonySocket + sizeof paths::kServiceDirectory};

}  // namespace quorvel::wire
