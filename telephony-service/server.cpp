#include "telephony-service/server.h"

#include <sys/socket.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "platform/ipc.h"
#include "property/binary/binary.h"
#include "telephony-service/listener.h"
#include "wire/failure.h"
#include "wire/telephony_state.h"

namespace quorvel::telephony {
namespace {

std::size_t most_peers() noexcept { return 256; }
constexpr int kRetryMilliseconds = 100;
constexpr int kEventsPerTurn = 1000;

SharedFrame reply_frame(std::uint64_t serial, const PropertyValue& value) {
  auto frame = std::make_shared<ByteBuffer>();
  return wire::append_frame(wire::FrameKind::reply, 0, serial, {}, value, *frame) ? frame : nullptr;
}

SharedFrame failure_frame(std::uint64_t serial, const std::string& description) {
  PropertyValue failure = PropertyValue::dictionary(2);
  auto frame = std::make_shared<ByteBuffer>();
  const bool built = failure.set(wire::kFailureCodeKey, PropertyValue::integer(platform::kRefusedArgument)) &&
                     failure.set(wire::kFailureDescriptionKey, PropertyValue::string(description)) &&
                     wire::append_frame(wire::FrameKind::failure, 0, serial, {}, failure, *frame);
  return built ? frame : nullptr;
}

}  // namespace

Server::Server(platform::host::ListeningSocket listener, Command command)
    : listener_(std::move(listener)), command_(std::move(command)), places_(most_peers) {}

void Server::add_waits(std::vector<pollfd>& waits) const {
  waits.push_back({rests_ ? -1 : listener_.get(), POLLIN, 0});
  for (const Peer& peer : peers_) {
    const bool reads = !peer.ended() && !peer.job && !peer.is_behind();
    waits.push_back(
        {peer.descriptor(), static_cast<short>((reads ? POLLIN : 0) | (peer.has_waiting() ? POLLOUT : 0)), 0});
  }
}

void Server::serve(std::span<const pollfd> waits) {
  std::size_t next = 1;
  for (auto peer = peers_.begin(); peer != peers_.end(); ++next) {
    const bool stays = waits[next].revents == 0 || serve_peer(*peer, waits[next].revents);
    peer = stays ? std::next(peer) : peers_.erase(peer);
  }
  carry_on_jobs();
  drop_the_slow();
  // Last, so that a new peer is not looked for among these waits.
  rests_ = false;
  if (waits[0].revents != 0) accept_all();
}

int Server::wait_milliseconds() const {
  auto wait = std::chrono::milliseconds(rests_ ? kRetryMilliseconds : -1);
  const auto now = Peer::Clock::now();
  for (const Peer& peer : peers_) {
    // A job that did not end in this turn goes on as soon as the observers allow it.
    if (peer.job && observers_keep_up()) return 0;
    if (!peer.has_waiting()) continue;
    const auto left =
        std::max(std::chrono::ceil<std::chrono::milliseconds>(peer.deadline() - now), std::chrono::milliseconds(0));
    wait = wait.count() < 0 ? left : std::min(wait, left);
  }
  return static_cast<int>(wait.count());
}

void Server::accept_all() {
  while (places_.bear_one_more()) {
    Descriptor connection(::accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC | SOCK_NONBLOCK));
    if (!connection) {
      if (errno == EINTR || errno == ECONNABORTED) continue;
      rests_ = errno != EAGAIN;
      return;
    }
    platform::host::prepare_to_receive(connection.get());
    if (is_trusted(connection.get())) {
      introduce(std::move(connection));
    } else {
      platform::host::close_connection(std::move(connection));
    }
    if (places_.are_overfull()) make_room();
  }
  rests_ = true;
}

// Of the user who holds most places, a connection of commands that is at rest gives way, or else the newest: those that
// have observed for long miss nothing.
void Server::make_room() {
  const uid_t heaviest = places_.heaviest();
  auto leaving = peers_.end();
  for (auto peer = peers_.begin(); peer != peers_.end(); ++peer) {
    if (peer->user() != heaviest) continue;
    leaving = peer;
    if (peer->commands && !peer->job && !peer->has_waiting()) break;
  }
  if (leaving != peers_.end()) peers_.erase(leaving);
}

// An observer collects the facts on an event only: one that comes late is told again of the events that matter.
void Server::introduce(Descriptor connection) {
  Peer& peer = peers_.emplace_back(std::move(connection), places_);
  bool sent = peer.has_place() && peer.send(frames_.state_frame());
  if (has_told_) {
    for (const std::string_view name : wire::kCatchUpEvents) {
      sent = sent && peer.send(frames_.event_frame(std::string(name)));
    }
  }
  if (!sent) peers_.pop_back();
}

bool Server::serve_peer(Peer& peer, short events) {
  if ((events & POLLOUT) != 0 && (!peer.flush() || !carry_out_calls(peer))) return false;
  if ((events & POLLIN) != 0) {
    if (!peer.receive() || !carry_out_calls(peer)) return false;
  } else if ((events & (POLLHUP | POLLERR)) != 0) {
    return false;
  }
  return !peer.ended() || peer.job || peer.has_waiting();
}

// One call at a time: while a notification is on its way, what follows it waits.
bool Server::carry_out_calls(Peer& peer) {
  wire::Frame call;
  while (!peer.job && !peer.is_behind()) {
    const wire::FrameResult result = peer.next_call(call);
    if (result == wire::FrameResult::incomplete) return true;
    if (result == wire::FrameResult::refused || !carry_out(peer, call)) return false;
  }
  return true;
}

bool Server::carry_out(Peer& peer, const wire::Frame& call) {
  peer.commands = true;
  const PropertyValue argument =
      call.payload.empty() ? PropertyValue() : read_binary(call.payload, Mutability::immutable);
  if (!argument && !call.payload.empty()) return answer(peer, call, {}, "the argument cannot be read");
  if (call.name == wire::kShowCommand) return answer(peer, call, frames_.value(), {});
  const std::string refusal = command_(call.name, argument);
  if (refusal.empty() && call.name == wire::kNotifyCommand) return start_notify(peer, call, argument);
  return answer(peer, call, {}, refusal);
}

bool Server::start_notify(Peer& peer, const wire::Frame& call, const PropertyValue& argument) {
  const std::string name(argument.get(wire::kCommandNameKey.text()).text());
  const PropertyValue& count = argument.get(wire::kCommandCountKey.text());
  if (!wire::is_telephony_notification(name)) return answer(peer, call, {}, "there is no such notification");
  if (count && !count.to_uint64()) return answer(peer, call, {}, "the count is no positive integer");
  const bool wants_reply = (call.head.flags & wire::kFlagNoReply) == 0;
  peer.job = NotifyJob{name, count ? *count.to_uint64() : 1, call.head.serial, wants_reply, 0};
  return true;
}

bool Server::answer(Peer& peer, const wire::Frame& call, const PropertyValue& value, const std::string& refusal) {
  if ((call.head.flags & wire::kFlagNoReply) != 0) return true;
  return peer.send(refusal.empty() ? reply_frame(call.head.serial, value) : failure_frame(call.head.serial, refusal));
}

// Sends what was asked for, as far as the observers keep up, but for no longer than a turn.
void Server::carry_on_jobs() {
  int events = 0;
  for (auto peer = peers_.begin(); peer != peers_.end();) {
    bool stays = true;
    while (stays && peer->job && observers_keep_up() && events < kEventsPerTurn) {
      if (peer->job->left > 0) {
        --peer->job->left;
        ++events;
        send_event(peer->job->name);
        continue;
      }
      const NotifyJob done = *std::exchange(peer->job, std::nullopt);
      stays =
          (!done.wants_reply || peer->send(reply_frame(done.serial, notify_result(done)))) && carry_out_calls(*peer);
      stays = stays && (!peer->ended() || peer->job || peer->has_waiting());
    }
    peer = stays ? std::next(peer) : peers_.erase(peer);
  }
}

PropertyValue Server::notify_result(const NotifyJob& job) const {
  PropertyValue result = PropertyValue::dictionary(2);
  const bool built = result.set(wire::kReplyObserversKey.text(), PropertyValue::unsigned_integer(observer_count())) &&
                     result.set(wire::kReplyCutOffKey.text(), PropertyValue::unsigned_integer(job.cut_off));
  return built ? result : PropertyValue();
}

void Server::send_event(const std::string& name) {
  has_told_ = true;
  const SharedFrame frame = frames_.event_frame(name);
  // A broken connection is found and dropped by the next wait.
  for (Peer& peer : peers_) {
    if (!peer.commands) static_cast<void>(peer.send(frame));
  }
}

void Server::drop_the_slow() {
  const auto now = Peer::Clock::now();
  const auto is_slow = [now](const Peer& peer) { return peer.has_waiting() && peer.deadline() <= now; };
  const auto lost =
      std::count_if(peers_.begin(), peers_.end(), [&](const Peer& peer) { return !peer.commands && is_slow(peer); });
  for (Peer& peer : peers_) {
    if (peer.job) peer.job->cut_off += static_cast<std::uint64_t>(lost);
  }
  peers_.remove_if(is_slow);
}

std::size_t Server::observer_count() const {
  return static_cast<std::size_t>(
      std::count_if(peers_.begin(), peers_.end(), [](const Peer& peer) { return !peer.commands; }));
}

bool Server::observers_keep_up() const {
  return std::none_of(peers_.begin(), peers_.end(),
                      [](const Peer& peer) { return !peer.commands && peer.is_behind(); });
}

}  // namespace quorvel::telephony
