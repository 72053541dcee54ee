#include <algorithm>
#include <cstring>

#include "client.h"
#include "client/core/observation.h"
#include "readiness.h"

using namespace quorvel::capi;
using quorvel::client::Notice;
using quorvel::client::Progress;

static_assert(static_cast<int>(Notice::Kind::taken_in) == QUORVEL_TAKEN_IN);
static_assert(static_cast<int>(Notice::Kind::notification) == QUORVEL_NOTIFICATION);
static_assert(static_cast<int>(Notice::Kind::missed) == QUORVEL_MISSED);

struct quorvel_observer {
  quorvel::client::Observation observation;
  Readiness readiness;
  Notice notice;  // told last
  char name[quorvel::wire::kMaximumNameLength + 1];
  bool ended = false;
};

namespace {

void tell_event(quorvel_observer& observer, quorvel_event& event) noexcept {
  const Notice& notice = observer.notice;
  const std::size_t length = std::min(notice.name.size(), sizeof observer.name - 1);
  if (length > 0) std::memcpy(observer.name, notice.name.data(), length);
  observer.name[length] = '\0';
  event.kind = static_cast<std::int32_t>(notice.kind);
  event.sequence = notice.sequence;
  event.missed = notice.missed;
  event.name = observer.name;
  event.object = lend(notice.object);
}

}  // namespace

quorvel_observer* quorvel_observer_start(const quorvel_client* client, quorvel_error* error) {
  if (client == nullptr) {
    tell(QUORVEL_INVALID_ARGUMENT, "An observer needs a client.", error);
    return nullptr;
  }
  auto* started = make<quorvel_observer>();
  if (started == nullptr) {
    tell_out_of_memory(error);
    return nullptr;
  }
  quorvel::client::Failure failure;
  if (started->observation.open(client->target(), failure) && started->readiness.open(failure) &&
      started->readiness.follow(started->observation.wait(), failure)) {
    return started;
  }
  unmake(started);
  tell(failure, error);
  return nullptr;
}

void quorvel_observer_free(quorvel_observer* observer) { unmake(observer); }

int quorvel_observer_descriptor(const quorvel_observer* observer) {
  return observer != nullptr ? observer->readiness.descriptor() : -1;
}

int quorvel_observer_step(quorvel_observer* observer, quorvel_event* event, quorvel_error* error) {
  if (observer == nullptr || observer->ended) {
    return tell(QUORVEL_INVALID_ARGUMENT, "There is no observer, or it has ended.", error);
  }
  quorvel::client::Failure failure;
  observer->notice = {};
  const Progress progress = observer->observation.step(observer->notice, failure);
  if (progress == Progress::failed || !observer->readiness.follow(observer->observation.wait(), failure)) {
    observer->ended = true;
    return tell(failure, error);
  }
  if (progress == Progress::waiting) return QUORVEL_NOT_YET;
  tell_event(*observer, *event);
  return QUORVEL_OK;
}

int quorvel_observer_wait(quorvel_observer* observer, int64_t milliseconds, quorvel_event* event,
                          quorvel_error* error) {
  const quorvel::client::Moment deadline = quorvel::client::moment_after(milliseconds);
  for (;;) {
    const int code = quorvel_observer_step(observer, event, error);
    if (code != QUORVEL_NOT_YET || quorvel::client::moment_now() >= deadline) return code;
    sleep_until_due(observer->observation.wait(), deadline);
  }
}
