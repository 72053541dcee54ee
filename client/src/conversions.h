// Between the client's types and those of the steps that it is made of.
#pragma once

#include "client/core/call.h"
#include "quorvel/client.h"

namespace quorvel::client {

/// Where `options` say that calls go; valid as long as they are.
[[nodiscard]] Target target_of(const Options& options) noexcept;

[[nodiscard]] inline Error error_of(const Failure& failure) {
  return {failure.code, failure.service_code, failure.sentence};
}

}  // namespace quorvel::client
