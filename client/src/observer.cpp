#include "quorvel/observer.h"

#include "client/core/observation.h"
#include "conversions.h"

namespace quorvel::client {

class Observer::Connection {
 public:
  std::optional<Error> open(const Options& options) {
    Failure failure;
    if (!observation_.open(target_of(options), failure)) return error_of(failure);
    Notice notice;
    if (std::optional<Error> error = wait_for(notice, kNever)) return error;
    first_sequence_ = notice.sequence;
    return {};
  }

  std::optional<Error> wait_for(Notice& notice, Moment deadline) {
    Failure failure;
    for (;;) {
      switch (observation_.step(notice, failure)) {
        case Progress::done: return {};
        case Progress::failed: return error_of(failure);
        case Progress::waiting: break;
      }
      if (moment_now() >= deadline) return Error{ErrorCode::timed_out, 0, "No notification came in time."};
      sleep_until_due(observation_.wait(), deadline);
    }
  }

  [[nodiscard]] std::uint64_t first_sequence() const noexcept { return first_sequence_; }

 private:
  Observation observation_;
  std::uint64_t first_sequence_ = 0;
};

Observer::Observer(Options options) : options_(std::move(options)) {}
Observer::Observer(Observer&&) noexcept = default;
Observer& Observer::operator=(Observer&&) noexcept = default;
Observer::~Observer() = default;

std::optional<Error> Observer::connect() {
  connection_.reset();
  auto connection = std::make_unique<Connection>();
  std::optional<Error> error = connection->open(options_);
  if (!error) connection_ = std::move(connection);
  return error;
}

std::uint64_t Observer::first_sequence() const noexcept { return connection_ ? connection_->first_sequence() : 0; }

std::optional<Error> Observer::next(Event& event, std::chrono::milliseconds timeout) {
  if (!connection_) return Error{ErrorCode::disconnected, 0, "The observer is not connected."};
  Notice notice;
  std::optional<Error> error = connection_->wait_for(notice, moment_after(timeout.count()));
  if (!error) {
    event = Event{notice.sequence, notice.missed, std::string(notice.name), std::move(notice.object)};
  } else if (error->code != ErrorCode::timed_out) {
    connection_.reset();
  }
  return error;
}

}  // namespace quorvel::client
