// Recording a telephony service.
#pragma once

#include <string>

namespace quorvel::tools {

/// Follows the telephony service until interrupted, and writes each state and event to the file `path`, "-" for
/// standard output, as one JSON dictionary a line (common/recording.h says which keys). Throws Failure.
int record_service(const std::string& path);

}  // namespace quorvel::tools
