// A call under way, one step at a time.
#pragma once

#include "client/core/connection.h"

namespace quorvel::client {

/// Where a call goes, and how much it may take. The pointers are needed until `Call::open` or `Observation::open`
/// returns.
struct Target {
  const char* root = nullptr;  // null: the device root that QUORVEL_ROOT names, else "/"
  std::string_view service = {};
  std::int64_t timeout = 10'000;  // milliseconds from opening to the last byte; negative: without end
  std::uint32_t maximum_reply = 1u << 30;
};

class Call {
 public:
  /// Gets ready to call `operation` with `argument` (none: no argument). False after setting `failure`.
  [[nodiscard]] bool open(const Target& target, std::string_view operation, const PropertyValue& argument,
                          Failure& failure) noexcept;

  /// Takes the next step. `done`: `reply` is the service's, a value or none.
  [[nodiscard]] Progress step(PropertyValue& reply, Failure& failure) noexcept;

  /// When the next step is due.
  [[nodiscard]] Wait wait() const noexcept;

 private:
  Connection connection_;
  Moment deadline_ = kNever;
};

}  // namespace quorvel::client
