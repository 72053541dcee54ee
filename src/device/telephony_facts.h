// The telephony facts collector: keeps what the data ark holds about the SIM, the subscriber and the baseband in step
// with the telephony service. It runs once for every delivery of an observed notification and keeps no state of its
// own between runs. Main thread only.
#pragma once

#include "platform/telephony.h"
#include "store/data_ark.h"

namespace quorvel {

/// Observes the telephony service for the life of the process; without a service, logs so and observes nothing. `ark`
/// is borrowed and must live as long.
void registerForTelvaneCallNotifications(DataArk* ark) noexcept;

/// Called for every delivery; `context` is the data ark.
void phone_center_callback(platform::TelephonyCenter* center, void* context, const PropertyValue& name,
                           const PropertyValue& object, const PropertyValue& user_info) noexcept;

}  // namespace quorvel
