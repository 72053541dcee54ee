#include "linux/base/resting_listener.h"

#include <sys/socket.h>

#include <cerrno>

#include "linux/base/attached_descriptors.h"
#include "linux/base/monotonic_clock.h"

namespace quorvel::platform::host {

namespace {

constexpr std::int64_t kRestMilliseconds = 50;
constexpr std::int64_t kBriefRestMilliseconds = 2;

}  // namespace

void RestingListener::open(const EventQueue& queue, int socket, std::uint32_t events) noexcept {
  queue_ = &queue;
  socket_ = socket;
  events_ = events;
  listen();
}

void RestingListener::close() noexcept {
  if (!is_resting()) queue_->remove(socket_);
  rests_until_ = kNever;
}

void RestingListener::listen() noexcept {
  const bool listens = queue_->add(socket_, events_, this);
  rests_until_ = listens ? kNever : monotonic_milliseconds() + kRestMilliseconds;
}

Descriptor RestingListener::accept() noexcept {
  for (;;) {
    Descriptor connection(::accept4(socket_, nullptr, nullptr, SOCK_NONBLOCK | SOCK_CLOEXEC));
    if (connection) prepare_to_receive(connection.get());
    if (connection || errno == EAGAIN) return connection;
    if (errno == EINTR || errno == ECONNABORTED) continue;
    const int error = errno;
    rest();
    errno = error;
    return connection;
  }
}

void RestingListener::rest() noexcept { rest_for(kRestMilliseconds); }

void RestingListener::rest_briefly() noexcept { rest_for(kBriefRestMilliseconds); }

void RestingListener::rest_for(std::int64_t milliseconds) noexcept {
  if (is_resting()) return;
  queue_->remove(socket_);
  rests_until_ = monotonic_milliseconds() + milliseconds;
}

void RestingListener::end_rest() noexcept {
  if (is_resting()) rests_until_ = 0;
}

void RestingListener::wake_when_due(std::int64_t now) noexcept {
  if (is_resting() && now >= rests_until_) listen();
}

}  // namespace quorvel::platform::host
