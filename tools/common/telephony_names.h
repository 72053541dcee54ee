// The telephony notifications that a person can have sent.
#pragma once

#include <algorithm>
#include <iterator>
#include <string_view>

#include "platform/telephony.h"

namespace quorvel::tools {

inline constexpr std::string_view kTelephonyNotifications[] = {
    platform::kSimNewlyInserted.text(),
    platform::kSimStatusChanged.text(),
    platform::kPhoneNumberChanged.text(),
    platform::kPostponementStatusChanged.text(),
};

[[nodiscard]] inline bool is_telephony_notification(std::string_view name) noexcept {
  return std::find(std::begin(kTelephonyNotifications), std::end(kTelephonyNotifications), name) !=
         std::end(kTelephonyNotifications);
}

}  // namespace quorvel::tools
