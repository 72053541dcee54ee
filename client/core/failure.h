// Why there is no result, in memory of its own: telling of a failure cannot fail.
#pragma once

#include <cstdint>
#include <initializer_list>
#include <string_view>

#include "client/core/error_code.h"

namespace quorvel::client {

struct Failure {
  ErrorCode code{};
  std::int32_t service_code = 0;
  char sentence[504] = {};  // for a person, of UTF-8 that ends with 0
};

/// Sets `failure` to a code and the sentence that `parts` make together. Control characters are escaped, and a sentence
/// too long is cut at a character. The service's code becomes 0.
void set_failure(Failure& failure, ErrorCode code, std::initializer_list<std::string_view> parts) noexcept;

/// The same with ": " and the system's words for `error`, an errno value, at the end.
void set_system_failure(Failure& failure, ErrorCode code, std::initializer_list<std::string_view> parts,
                        int error) noexcept;

}  // namespace quorvel::client
