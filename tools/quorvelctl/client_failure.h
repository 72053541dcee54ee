// What a person can do about a service that cannot be reached.
#pragma once

#include <string>

#include "common/failure.h"
#include "quorvel/client.h"

namespace quorvel::tools {

/// A Failure with kUnreachable for an error met while calling `service` (as people call it), which `program` serves.
[[nodiscard]] Failure unreachable(const client::Error& error, const std::string& service, const std::string& program);

}  // namespace quorvel::tools
