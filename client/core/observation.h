// An observer's connection to the notification center, one step at a time.
#pragma once

#include "client/core/call.h"

namespace quorvel::client {

struct Notice {
  enum class Kind { taken_in = 1, notification, missed };
  Kind kind = Kind::taken_in;
  std::uint64_t sequence = 0;  // of the notification; else the newest when taken in, the last one missed
  std::uint64_t missed = 0;    // how many notifications were dropped because the observer read too slowly
  std::string_view name = {};  // valid until the next step
  PropertyValue object = {};
};

class Observation {
 public:
  /// Gets ready to connect in the target's device root; its timeout is that of being taken in. False after setting
  /// `failure`.
  [[nodiscard]] bool open(const Target& target, Failure& failure) noexcept;

  /// Takes the next step. `done`: `notice` is the next one. The first says that the observer was taken in.
  [[nodiscard]] Progress step(Notice& notice, Failure& failure) noexcept;

  /// When the next step is due.
  [[nodiscard]] Wait wait() const noexcept;

 private:
  [[nodiscard]] bool take_notice(const wire::Frame& frame, Notice& notice) noexcept;

  Connection connection_;
  bool taken_in_ = false;
  Moment deadline_ = kNever;
};

}  // namespace quorvel::client
