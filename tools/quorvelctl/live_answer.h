// Keys of the data ark that are not stored but answered by the device.
#pragma once

#include <string>
#include <string_view>

#include "property/value.h"
#include "store/live_answer_table.h"

namespace quorvel::tools {

struct LiveAnswer {
  const larry_info* row = nullptr;  // null for a key that is stored
  PropertyValue value;              // none when the device-information service has no answer
  std::string origin;               // the file or source that answered
  std::string_view unit;            // empty where the kind says it all
};

/// What the daemon would answer for a key at this moment, if it is one of the live ones; asked as the caller.
[[nodiscard]] LiveAnswer live_answer(const std::string& domain, bool has_domain, const std::string& key);
[[nodiscard]] LiveAnswer live_answer(const larry_info& row);

}  // namespace quorvel::tools
