#include "linux/base/places.h"

#include <sys/socket.h>

#include <algorithm>

namespace quorvel::platform::host {

namespace {

// A user with more connections than this gets less room in the kernel for unread bytes on the others: no program needs
// so many, and each could leave them unread. So does everybody who comes when all together have more than a device has
// programs, because one person may be many users. The kernel doubles the number.
constexpr std::size_t kOrdinaryConnections = 16;
constexpr std::size_t kOrdinaryCrowd = 256;
constexpr int kSmallSendRoom = 4096;

}  // namespace

Peer peer_of(int socket) noexcept {
  ucred credentials = {};
  socklen_t size = sizeof credentials;
  if (::getsockopt(socket, SOL_SOCKET, SO_PEERCRED, &credentials, &size) != 0) return {};
  return {credentials.uid, credentials.pid};
}

Places::Share* Places::find(uid_t user) noexcept {
  Share* const end = users_ + user_count_;
  Share* const found = std::find_if(users_, end, [user](const Share& share) { return share.user == user; });
  return found != end ? found : nullptr;
}

std::size_t Places::take(uid_t user) noexcept {
  const LockHold hold(lock_);
  Share* share = find(user);
  if (share == nullptr && user_count_ == capacity_) {
    const std::size_t larger = std::max<std::size_t>(8, capacity_ * 2);
    void* grown = std::realloc(users_, larger * sizeof(Share));
    if (grown == nullptr) return 0;
    users_ = static_cast<Share*>(grown);
    capacity_ = larger;
  }
  if (share == nullptr) {
    share = users_ + user_count_++;
    *share = {user, 0, 0};
  }
  count_.fetch_add(1, std::memory_order_relaxed);
  return ++share->connections;
}

void Places::give_back(uid_t user) noexcept {
  const LockHold hold(lock_);
  Share* share = find(user);
  if (share == nullptr) return;
  count_.fetch_sub(1, std::memory_order_relaxed);
  if (--share->connections == 0) *share = users_[--user_count_];
}

void Places::bound_send_room(int socket, std::size_t held) const noexcept {
  if (held <= kOrdinaryConnections && count_.load(std::memory_order_relaxed) <= kOrdinaryCrowd) return;
  ::setsockopt(socket, SOL_SOCKET, SO_SNDBUF, &kSmallSendRoom, sizeof kSmallSendRoom);
}

void Places::hold(uid_t user, std::size_t before, std::size_t now) noexcept {
  if (before == now) return;
  held_.fetch_add(now - before, std::memory_order_relaxed);
  const LockHold lock(lock_);
  if (Share* share = find(user)) share->held += now - before;
}

uid_t Places::largest(std::size_t Share::*amount) noexcept {
  const LockHold hold(lock_);
  const Share* const most =
      std::max_element(users_, users_ + user_count_,
                       [amount](const Share& left, const Share& right) { return left.*amount < right.*amount; });
  return most != users_ + user_count_ ? most->user : static_cast<uid_t>(-1);
}

uid_t Places::heaviest() noexcept { return largest(&Share::connections); }

uid_t Places::greediest() noexcept { return largest(&Share::held); }

}  // namespace quorvel::platform::host
