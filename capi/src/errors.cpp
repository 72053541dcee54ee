#include <cstring>

#include "handles.h"

namespace quorvel::capi {

using client::ErrorCode;

static_assert(static_cast<int>(ErrorCode::invalid_root) == QUORVEL_INVALID_ROOT);
static_assert(static_cast<int>(ErrorCode::service_absent) == QUORVEL_SERVICE_ABSENT);
static_assert(static_cast<int>(ErrorCode::access_denied) == QUORVEL_ACCESS_DENIED);
static_assert(static_cast<int>(ErrorCode::invalid_argument) == QUORVEL_INVALID_ARGUMENT);
static_assert(static_cast<int>(ErrorCode::timed_out) == QUORVEL_TIMED_OUT);
static_assert(static_cast<int>(ErrorCode::disconnected) == QUORVEL_DISCONNECTED);
static_assert(static_cast<int>(ErrorCode::protocol_error) == QUORVEL_PROTOCOL_ERROR);
static_assert(static_cast<int>(ErrorCode::service_failure) == QUORVEL_SERVICE_FAILURE);
static_assert(static_cast<int>(ErrorCode::system_failure) == QUORVEL_SYSTEM_FAILURE);
static_assert(sizeof(quorvel_error::sentence) == sizeof(client::Failure::sentence));
static_assert(sizeof(quorvel_error) == 512);

int tell(const client::Failure& failure, quorvel_error* error) noexcept {
  if (error != nullptr) {
    error->code = static_cast<std::int32_t>(failure.code);
    error->service_code = failure.service_code;
    std::memcpy(error->sentence, failure.sentence, sizeof error->sentence);
  }
  return static_cast<int>(failure.code);
}

int tell(quorvel_code code, std::string_view sentence, quorvel_error* error) noexcept {
  client::Failure failure;
  client::set_failure(failure, static_cast<ErrorCode>(code), {sentence});
  return tell(failure, error);
}

int tell_out_of_memory(quorvel_error* error) noexcept {
  return tell(QUORVEL_SYSTEM_FAILURE, "Memory does not suffice.", error);
}

}  // namespace quorvel::capi

const char* quorvel_version(void) { return QUORVEL_VERSION; }
