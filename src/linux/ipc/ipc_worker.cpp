#include "linux/ipc/ipc_worker.h"

#include <sched.h>
#include <sys/eventfd.h>
#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <utility>

#include "linux/base/connection_limit.h"
#include "linux/base/monotonic_clock.h"
#include "linux/base/thread.h"
#include "linux/ipc/ipc_listener.h"

namespace quorvel::platform::host {

namespace {

// How long a client may take over a call from its first byte, and over taking a whole reply.
constexpr std::int64_t kCallMilliseconds = 10'000;
constexpr std::int64_t kReplyMilliseconds = 30'000;

// How long a thread that ends goes on for calls that are under way.
constexpr std::int64_t kFinishMilliseconds = 100;

// How long a thread stays awake for the next call of a client that called before.
constexpr std::int64_t kAwakeMicroseconds = 50;

// What connections may hold of calls that are not whole yet, all of them together.
constexpr std::size_t kHeldInputBudget = 4u << 20;

constexpr int kEventsAtOnce = 64;

}  // namespace

IpcWorker::~IpcWorker() {
  take_in_handed_over();
  close_all();
}

bool IpcWorker::prepare(IpcListener& listener) noexcept {
  listener_ = &listener;
  outgoing_.waiting = &listener.waiting_replies();
  epoll_ = Descriptor(::epoll_create1(EPOLL_CLOEXEC));
  wake_ = Descriptor(::eventfd(0, EFD_CLOEXEC | EFD_NONBLOCK));
  if (!epoll_ || !wake_) return false;
  epoll_event event = {};
  event.events = EPOLLIN;
  event.data.ptr = &wake_;
  return ::epoll_ctl(epoll_.get(), EPOLL_CTL_ADD, wake_.get(), &event) == 0;
}

bool IpcWorker::start() noexcept {
  errno = start_thread(thread_, run_thread, this);
  started_ = errno == 0;
  return started_;
}

void IpcWorker::begin_to_stop() noexcept {
  stopping_.store(true, std::memory_order_release);
  if (started_) ::eventfd_write(wake_.get(), 1);
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
  listen();
  while (!stopping_.load(std::memory_order_acquire)) {
    const int count = wait_for_events(events);
    now_ = monotonic_milliseconds();
    for (int i = 0; i < count; ++i) handle(events[i]);
    serve_ready();
    close_overdue();
    free_closed();
    if (listen_again_ != 0 && now_ >= listen_again_) listen();
  }
  finish();
}

// Nobody is let in any more, but whoever was let in a moment ago, has begun a call or takes a reply is served: a
// service that is started again loses no call, because those that were not let in wait in the socket for the next one.
void IpcWorker::finish() noexcept {
  epoll_event events[kEventsAtOnce];
  ::epoll_ctl(epoll_.get(), EPOLL_CTL_DEL, listener_->descriptor(), nullptr);
  take_in_handed_over();
  const std::int64_t end = monotonic_milliseconds() + kFinishMilliseconds;
  for (now_ = monotonic_milliseconds(); has_calls_under_way() && now_ < end; now_ = monotonic_milliseconds()) {
    const int limit = list_of(Stage::ready).empty() ? static_cast<int>(end - now_) : 0;
    const int count = ::epoll_wait(epoll_.get(), events, kEventsAtOnce, limit);
    for (int i = 0; i < count; ++i) {
      if (events[i].data.ptr != listener_) handle(events[i]);
    }
    serve_ready();
    free_closed();
  }
}

bool IpcWorker::has_calls_under_way() const noexcept {
  for (const Stage stage : {Stage::fresh, Stage::partial, Stage::ready, Stage::sending}) {
    if (!list_of(stage).empty()) return true;
  }
  return false;
}

// Waking a thread can take longer than a whole call: a client that calls again and again is awaited for a moment
// without going to sleep, while everybody else may run.
int IpcWorker::wait_for_events(std::span<epoll_event> events) noexcept {
  const auto wait = [&](int milliseconds) {
    return ::epoll_wait(epoll_.get(), events.data(), static_cast<int>(events.size()), milliseconds);
  };
  const int limit = wait_limit();
  if (std::exchange(expects_call_, false) && limit != 0) {
    const std::int64_t end = monotonic_microseconds() + kAwakeMicroseconds;
    do {
      if (const int count = wait(0); count != 0) return count;
      ::sched_yield();
    } while (monotonic_microseconds() < end);
  }
  return wait(limit);
}

void IpcWorker::handle(const epoll_event& event) noexcept {
  if (event.data.ptr == listener_) {
    accept_some();
  } else if (event.data.ptr == &wake_) {
    eventfd_t count;
    ::eventfd_read(wake_.get(), &count);
    take_in_handed_over();
    if (must_make_room_.exchange(false)) make_room();
  } else {
    serve(*static_cast<IpcConnection*>(event.data.ptr));
  }
}

// Milliseconds until something is due that no event announces, -1 when nothing is.
int IpcWorker::wait_limit() const noexcept {
  if (!list_of(Stage::ready).empty()) return 0;
  std::int64_t due = INT64_MAX;
  if (const IpcConnection* first = list_of(Stage::partial).front())
    due = std::min(due, first->since + kCallMilliseconds);
  if (const IpcConnection* first = list_of(Stage::sending).front()) {
    due = std::min(due, first->since + kReplyMilliseconds);
  }
  if (listen_again_ != 0) due = std::min(due, listen_again_);
  if (due == INT64_MAX) return -1;
  return static_cast<int>(std::clamp<std::int64_t>(due - monotonic_milliseconds(), 1, kReplyMilliseconds));
}

void IpcWorker::serve(IpcConnection& connection) noexcept {
  switch (connection.stage) {
    case Stage::fresh:
    case Stage::idle:
    case Stage::partial: return receive(connection);
    case Stage::sending:
      connection.continue_sending();
      if (connection.is_broken()) return close(connection);
      if (!connection.has_waiting_reply()) finish_reply(connection);
      return;
    case Stage::ready:
    case Stage::closed: return;
  }
}

// Reads once. Bytes are looked at where they were received; a connection keeps only what is left of them.
void IpcWorker::receive(IpcConnection& connection) noexcept {
  const ssize_t count = ::recv(connection.descriptor(), room_, sizeof room_, MSG_DONTWAIT);
  if (count < 0) {
    if (errno != EAGAIN && errno != EINTR) close(connection);
    return;
  }
  const std::span<const std::byte> received(room_, static_cast<std::size_t>(count));
  if (received.empty()) {
    connection.input_ended = true;
  } else if (connection.input.empty()) {
    return take_turn(connection, received);
  } else if (!connection.input.append(received.data(), received.size())) {
    return close(connection);
  }
  take_turn(connection, connection.input.bytes());
}

// Runs the first call in `bytes`, if it is whole, and keeps the others for later turns: a client that sends many calls
// at once gets no more than one before everybody else has had theirs.
void IpcWorker::take_turn(IpcConnection& connection, std::span<const std::byte> bytes) noexcept {
  wire::Frame frame;
  const wire::FrameResult result = wire::parse_frame(bytes, kMaximumCallBody, frame);
  if (result == wire::FrameResult::refused) return close(connection);
  std::size_t used = 0;
  if (result == wire::FrameResult::complete) {
    if (frame.head.kind != wire::FrameKind::call) return close(connection);
    expects_call_ |= std::exchange(connection.has_called, true);
    connection.run_call(frame, outgoing_);
    if (connection.is_broken()) return close(connection);
    used = wire::kFrameHeadSize + frame.head.body_length;
    // The rest of the input, if any, begins a call of its own, with its own time.
    move_to(connection, Stage::idle);
  }
  if (bytes.data() == connection.input.data()) {
    connection.input.consume(used);
    if (connection.input.empty()) connection.input.clear(0);
  } else if (!connection.input.append(bytes.data() + used, bytes.size() - used)) {
    return close(connection);
  }
  if (connection.has_waiting_reply()) {
    move_to(connection, Stage::sending);
    return set_interest(connection, EPOLLOUT);
  }
  settle(connection);
  bound_held_input();
}

// Many clients that each begin a call would together hold more than the device can spare: beyond the budget, the oldest
// unfinished calls of the user who holds most connections end, and where this worker has none, its oldest.
void IpcWorker::bound_held_input() noexcept {
  while (listener_->held_input() > kHeldInputBudget) {
    const uid_t heaviest = listener_->shares().heaviest();
    ConnectionList& partial = list_of(Stage::partial);
    IpcConnection* oldest = partial.front();
    while (oldest != nullptr && oldest->peer().user != heaviest) oldest = partial.after(oldest);
    if (oldest == nullptr) oldest = partial.front();
    if (oldest == nullptr) return;
    close(*oldest);
  }
}

// Finds out what a connection without a waiting reply waits for next.
void IpcWorker::settle(IpcConnection& connection) noexcept {
  listener_->count_input(connection);
  wire::Frame frame;
  const bool has_input = !connection.input.empty();
  if (has_input &&
      wire::parse_frame(connection.input.bytes(), kMaximumCallBody, frame) != wire::FrameResult::incomplete) {
    return move_to(connection, Stage::ready);
  }
  if (connection.input_ended) return close(connection);
  if (!has_input) {
    if (connection.stage > Stage::idle) move_to(connection, Stage::idle);
  } else if (connection.stage != Stage::partial) {
    move_to(connection, Stage::partial);
  }
}

void IpcWorker::finish_reply(IpcConnection& connection) noexcept {
  listener_->waiting_replies().forget_unused();
  move_to(connection, Stage::idle);
  set_interest(connection, EPOLLIN);
  if (connection.stage != Stage::closed) settle(connection);
}

// One turn for each connection that was ready before the round.
void IpcWorker::serve_ready() noexcept {
  ConnectionList round;
  round.take_all(list_of(Stage::ready));
  while (IpcConnection* connection = round.front()) {
    connection->unlink();
    take_turn(*connection, connection->input.bytes());
  }
}

void IpcWorker::move_to(IpcConnection& connection, Stage stage) noexcept {
  connection.stage = stage;
  connection.since = now_;
  list_of(stage).push_back(&connection);
}

void IpcWorker::set_interest(IpcConnection& connection, std::uint32_t events) noexcept {
  if (connection.interest == events) return;
  epoll_event event = {};
  event.events = events;
  event.data.ptr = &connection;
  const int operation = connection.interest == 0 ? EPOLL_CTL_ADD : EPOLL_CTL_MOD;
  if (::epoll_ctl(epoll_.get(), operation, connection.descriptor(), &event) != 0) return close(connection);
  connection.interest = events;
}

void IpcWorker::close(IpcConnection& connection) noexcept {
  if (connection.stage == Stage::closed) return;
  connection.close();
  connection.input.clear(0);
  listener_->count_input(connection);
  listener_->shares().remove(connection.peer().user);
  move_to(connection, Stage::closed);
  count_.fetch_sub(1, std::memory_order_relaxed);
  // A descriptor is free again.
  if (listen_again_ != 0) listen_again_ = now_;
}

void IpcWorker::close_overdue() noexcept {
  for (const auto& [stage, limit] :
       {std::pair(Stage::partial, kCallMilliseconds), std::pair(Stage::sending, kReplyMilliseconds)}) {
    IpcConnection* first = nullptr;
    while ((first = list_of(stage).front()) != nullptr && first->since + limit <= now_) close(*first);
  }
}

void IpcWorker::close_all() noexcept {
  for (ConnectionList& list : lists_) {
    if (&list == &list_of(Stage::closed)) break;
    while (IpcConnection* connection = list.front()) close(*connection);
  }
  free_closed();
}

// A connection is freed only after the batch of events that it was closed in, which may still name it.
void IpcWorker::free_closed() noexcept {
  bool waited = false;
  while (IpcConnection* connection = list_of(Stage::closed).front()) {
    waited |= connection->has_waiting_reply();
    delete connection;
  }
  if (waited) listener_->waiting_replies().forget_unused();
}

}  // namespace quorvel::platform::host
