// An observer of the system notification center.
#pragma once

#include <chrono>
#include <cstdint>
#include <memory>
#include <optional>
#include <string>

#include "quorvel/client.h"

namespace quorvel::client {

/// What an observer is told: a notification, or, when `missed` is not 0, that so many were dropped because it read too
/// slowly; `sequence` is then that of the last one dropped.
struct Event {
  std::uint64_t sequence = 0;
  std::uint64_t missed = 0;
  std::string name;
  PropertyValue object;
};

/// One connection to the notification center. One thread at a time.
class Observer {
 public:
  /// `options.service` does not count here; the timeout is that of `connect`.
  explicit Observer(Options options = {});
  Observer(Observer&&) noexcept;
  Observer& operator=(Observer&&) noexcept;
  ~Observer();

  /// Connects and waits to be taken in: every notification posted after the return will be heard of. Returns why not,
  /// or nothing. An earlier connection ends.
  [[nodiscard]] std::optional<Error> connect();

  /// Sequence number of the newest notification when the observer was taken in.
  [[nodiscard]] std::uint64_t first_sequence() const noexcept;

  /// Waits for the next event; a negative timeout waits without end. Returns why there is none, or nothing. After
  /// `timed_out` the observer goes on as before, after any other error it has to connect again.
  [[nodiscard]] std::optional<Error> next(Event& event, std::chrono::milliseconds timeout);

 private:
  class Connection;
  Options options_;
  std::unique_ptr<Connection> connection_;
};

}  // namespace quorvel::client
