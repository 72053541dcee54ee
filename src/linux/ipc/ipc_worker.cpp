#include "linux/ipc/ipc_worker.h"

#include <sched.h>

#include <algorithm>
#include <cerrno>
#include <utility>

#include "linux/base/monotonic_clock.h"
#include "linux/base/thread.h"
#include "linux/ipc/ipc_listener.h"

namespace quorvel::platform::host {

namespace {

// How long a thread that ends goes on for calls that are under way.
constexpr std::int64_t kFinishMilliseconds = 100;

// How long a thread stays awake for the next call of a client that called before.
constexpr std::int64_t kAwakeMicroseconds = 50;

constexpr int kEventsAtOnce = 64;

}  // namespace

IpcWorker::~IpcWorker() {
  take_in_handed_over();
  for (const Stage stage : {Stage::fresh, Stage::idle, Stage::partial, Stage::ready, Stage::sending}) {
    while (IpcConnection* connection = stages_.oldest(stage)) close(*connection);
  }
  free_closed();
}

bool IpcWorker::prepare(IpcListener& listener) noexcept {
  listener_ = &listener;
  outgoing_.waiting = &listener.waiting_replies();
  return queue_.open_with_bell();
}

bool IpcWorker::start() noexcept {
  errno = start_thread(thread_, run_thread, this);
  started_ = errno == 0;
  return started_;
}

void IpcWorker::begin_to_stop() noexcept {
  stopping_.store(true, std::memory_order_release);
  if (started_) queue_.ring();
}

bool IpcWorker::wait_for_end(std::int64_t deadline) noexcept {
  if (started_ && join_thread(thread_, deadline)) started_ = false;
  return !started_;
}

void* IpcWorker::run_thread(void* worker) noexcept {
  name_this_thread("ipc");
  static_cast<IpcWorker*>(worker)->run();
  return nullptr;
}

void IpcWorker::run() noexcept {
  epoll_event events[kEventsAtOnce];
  acceptor_.open(*listener_, queue_);
  while (!stopping_.load(std::memory_order_acquire)) {
    const int count = wait_for_events(events);
    now_ = monotonic_milliseconds();
    for (int i = 0; i < count; ++i) handle(events[i]);
    serve_ready();
    close_overdue();
    free_closed();
    acceptor_.wake_when_due(now_);
  }
  finish();
}

// Nobody is let in any more, but whoever was let in a moment ago, has begun a call or takes a reply is served: a
// service that is started again loses no call, because those that were not let in wait in the socket for the next one.
void IpcWorker::finish() noexcept {
  epoll_event events[kEventsAtOnce];
  acceptor_.close();
  take_in_handed_over();
  const std::int64_t end = monotonic_milliseconds() + kFinishMilliseconds;
  for (now_ = monotonic_milliseconds(); has_calls_under_way() && now_ < end; now_ = monotonic_milliseconds()) {
    const int count = queue_.wait(events, stages_.has(Stage::ready) ? 0 : static_cast<int>(end - now_));
    for (int i = 0; i < count; ++i) {
      if (!acceptor_.is_event(events[i])) handle(events[i]);
    }
    serve_ready();
    free_closed();
  }
}

bool IpcWorker::has_calls_under_way() const noexcept {
  return stages_.has(Stage::fresh) || stages_.has(Stage::partial) || stages_.has(Stage::ready) ||
         stages_.has(Stage::sending);
}

// Milliseconds until something is due that no event announces, -1 when nothing is.
int IpcWorker::wait_limit() const noexcept {
  if (stages_.has(Stage::ready)) return 0;
  return milliseconds_until(std::min(stages_.due(), acceptor_.due()));
}

// Waking a thread can take longer than a whole call: a client that calls again and again is awaited for a moment
// without going to sleep, while everybody else may run.
int IpcWorker::wait_for_events(std::span<epoll_event> events) noexcept {
  const int limit = wait_limit();
  if (std::exchange(expects_call_, false) && limit != 0) {
    const std::int64_t end = monotonic_microseconds() + kAwakeMicroseconds;
    do {
      if (const int count = queue_.wait(events, 0); count != 0) return count;
      ::sched_yield();
    } while (monotonic_microseconds() < end);
  }
  return queue_.wait(events, limit);
}

void IpcWorker::handle(const epoll_event& event) noexcept {
  if (acceptor_.is_event(event)) {
    acceptor_.accept_some();
  } else if (queue_.is_bell(event)) {
    queue_.silence();
    take_in_handed_over();
    if (must_make_room_.exchange(false)) {
      acceptor_.make_room();
      bound_held_input();
    }
  } else {
    serve(*static_cast<IpcConnection*>(event.data.ptr));
  }
}

void IpcWorker::ask_for_room() noexcept {
  must_make_room_.store(true);
  queue_.ring();
}

void IpcWorker::hand_over(IpcConnection& connection) noexcept {
  count_.fetch_add(1, std::memory_order_relaxed);
  {
    const LockHold hold(lock_);
    handed_over_.push_back(&connection);
  }
  queue_.ring();
}

void IpcWorker::take_in_handed_over() noexcept {
  IntrusiveList<IpcConnection> arrived;
  {
    const LockHold hold(lock_);
    arrived.take_all(handed_over_);
  }
  while (IpcConnection* connection = arrived.front()) {
    stages_.move(*connection, Stage::fresh, now_);
    set_interest(*connection, EPOLLIN);
  }
}

// A client that sends a call and leaves, or sends something that is no call, costs no more than that: the queue never
// hears of it.
bool IpcWorker::take_in(IpcConnection& connection) noexcept {
  count_.fetch_add(1, std::memory_order_relaxed);
  stages_.move(connection, Stage::fresh, now_);
  receive(connection);
  if (connection.interest == 0 && connection.stage != Stage::closed) set_interest(connection, EPOLLIN);
  return connection.stage == Stage::closed;
}

void IpcWorker::serve(IpcConnection& connection) noexcept {
  switch (connection.stage) {
    case Stage::fresh:
    case Stage::idle:
    case Stage::partial: return receive(connection);
    case Stage::sending: return go_on_sending(connection);
    case Stage::ready:
    case Stage::closed: return;
  }
}

// Reads once. Bytes are looked at where they were received; a connection keeps only what is left of them.
void IpcWorker::receive(IpcConnection& connection) noexcept {
  const ssize_t count = receive_bytes(connection.descriptor(), room_);
  if (count < 0) {
    if (errno != EAGAIN && errno != EINTR) close(connection);
    return;
  }
  connection.input_ended = count == 0;
  if (!connection.input.borrow({room_, static_cast<std::size_t>(count)})) return close(connection);
  switch (find_call(connection)) {
    case wire::FrameResult::complete: return run_call(connection);
    case wire::FrameResult::incomplete: return settle(connection);
    case wire::FrameResult::refused: return close(connection);
  }
}

// Takes the next call off the input.
wire::FrameResult IpcWorker::find_call(IpcConnection& connection) noexcept {
  const wire::FrameResult result = connection.input.next(kMaximumCallBody, connection.call);
  if (result != wire::FrameResult::complete) return result;
  return connection.call.head.kind == wire::FrameKind::call ? result : wire::FrameResult::refused;
}

// Runs the call that was found. What is left of the input begins a call of its own, with its own time: a client that
// sends many calls at once gets no more than one before everybody else has had theirs.
void IpcWorker::run_call(IpcConnection& connection) noexcept {
  expects_call_ |= std::exchange(connection.has_called, true);
  connection.run_call(connection.call, outgoing_);
  if (connection.is_broken()) return close(connection);
  if (!connection.has_waiting_reply()) {
    stages_.move(connection, Stage::idle, now_);
    return settle(connection);
  }
  // The next call is read once the client has taken this reply.
  if (!connection.input.keep()) return close(connection);
  note_held_input(connection);
  // The calls of this round may have taken long, which is not the client's fault.
  stages_.move(connection, Stage::sending, monotonic_milliseconds());
  set_interest(connection, EPOLLOUT);
  bound_held_input();
}

// Finds out what a connection without a waiting reply waits for next.
void IpcWorker::settle(IpcConnection& connection) noexcept {
  if (!connection.input.keep()) return close(connection);
  note_held_input(connection);
  const bool has_input = !connection.input.empty();
  const wire::FrameResult next = has_input ? find_call(connection) : wire::FrameResult::incomplete;
  if (next == wire::FrameResult::refused) return close(connection);
  if (next == wire::FrameResult::complete) {
    stages_.move(connection, Stage::ready, now_);
  } else if (connection.input_ended) {
    return close(connection);
  } else if (has_input && connection.stage != Stage::partial) {
    stages_.move(connection, Stage::partial, now_);
  }
  bound_held_input();
}

void IpcWorker::go_on_sending(IpcConnection& connection) noexcept {
  connection.continue_sending();
  if (connection.is_broken()) return close(connection);
  if (connection.has_waiting_reply()) return;
  listener_->waiting_replies().forget_unused();
  stages_.move(connection, Stage::idle, now_);
  set_interest(connection, EPOLLIN);
  if (connection.stage != Stage::closed) settle(connection);
}

void IpcWorker::set_interest(IpcConnection& connection, std::uint32_t events) noexcept {
  if (connection.interest == events) return;
  const bool done = connection.interest == 0 ? queue_.add(connection.descriptor(), events, &connection)
                                             : queue_.change(connection.descriptor(), events, &connection);
  if (!done) return close(connection);
  connection.interest = events;
}

void IpcWorker::note_held_input(IpcConnection& connection) noexcept {
  const std::size_t held = connection.input.held();
  listener_->places().hold(connection.peer().user, std::exchange(connection.noted_input, held), held);
}

// One turn for each connection that was ready before the round.
void IpcWorker::serve_ready() noexcept {
  IntrusiveList<IpcConnection> round;
  stages_.take_all(Stage::ready, round);
  while (IpcConnection* connection = round.front()) {
    connection->unlink();
    run_call(*connection);
  }
}

// Many clients that each begin a call would together hold more than the device can spare. Beyond the budget, the oldest
// of the user whose clients hold most end: those in the middle of a call first, then those that keep calls waiting
// because they do not take a reply.
void IpcWorker::bound_held_input() noexcept {
  while (listener_->places().hold_too_much()) {
    const uid_t greediest = listener_->places().greediest();
    IpcConnection* oldest = stages_.oldest(Stage::partial, greediest);
    if (oldest == nullptr) oldest = stages_.oldest(Stage::sending, greediest);
    if (oldest == nullptr) return listener_->ask_others_for_room(*this);
    close(*oldest);
  }
}

void IpcWorker::close(IpcConnection& connection) noexcept {
  if (connection.stage == Stage::closed) return;
  if (connection.interest != 0) queue_.remove(connection.descriptor());
  connection.close();
  connection.input.clear();
  note_held_input(connection);
  listener_->places().give_back(connection.peer().user);
  stages_.move(connection, Stage::closed, now_);
  count_.fetch_sub(1, std::memory_order_relaxed);
  acceptor_.end_rest();
}

void IpcWorker::close_overdue() noexcept {
  while (IpcConnection* connection = stages_.overdue(now_)) close(*connection);
}

// A connection is freed only after the batch of events that it was closed in, which may still name it.
void IpcWorker::free_closed() noexcept {
  bool waited = false;
  while (IpcConnection* connection = stages_.oldest(Stage::closed)) {
    waited |= connection->has_waiting_reply();
    delete connection;
  }
  if (waited) listener_->waiting_replies().forget_unused();
}

}  // namespace quorvel::platform::host
