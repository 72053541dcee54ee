#pragma once

#include "property/value.h"

namespace quorvel::platform {

/// Posts a named notification to everybody who is connected to the system notification center, at once and in order.
/// `name` and `object` are strings. Only puts a message where it cannot block, so it may be called under a lock. Any
/// thread.
void post_notification(const PropertyValue& name, const PropertyValue& object) noexcept;

}  // namespace quorvel::platform
