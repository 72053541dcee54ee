// Keys of the data ark that are not stored but answered by the device.
#pragma once

#include <string>

#include "property/value.h"

namespace quorvel::tools {

struct LiveAnswer {
  bool is_live = false;
  PropertyValue value;  // none when the device-information service has no answer
};

/// What the daemon would answer for a key at this moment, if it is one of the live ones.
[[nodiscard]] LiveAnswer live_answer(const std::string& domain, bool has_domain, const std::string& key);

}  // namespace quorvel::tools
