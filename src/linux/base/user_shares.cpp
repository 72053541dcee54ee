#include "linux/base/user_shares.h"

#include <sys/socket.h>

#include <algorithm>

namespace quorvel::platform::host {

Peer peer_of(int socket) noexcept {
  ucred credentials = {};
  socklen_t size = sizeof credentials;
  if (::getsockopt(socket, SOL_SOCKET, SO_PEERCRED, &credentials, &size) != 0) return {};
  return {credentials.uid, credentials.pid};
}

UserShares::Share* UserShares::find(uid_t user) noexcept {
  Share* const end = users_ + count_;
  Share* const found = std::find_if(users_, end, [user](const Share& share) { return share.user == user; });
  return found != end ? found : nullptr;
}

std::size_t UserShares::add(uid_t user) noexcept {
  const LockHold hold(lock_);
  if (Share* share = find(user)) return ++share->connections;
  if (count_ == capacity_) {
    const std::size_t larger = std::max<std::size_t>(8, capacity_ * 2);
    void* grown = std::realloc(users_, larger * sizeof(Share));
    if (grown == nullptr) return 0;
    users_ = static_cast<Share*>(grown);
    capacity_ = larger;
  }
  users_[count_++] = {user, 1};
  return 1;
}

void UserShares::remove(uid_t user) noexcept {
  const LockHold hold(lock_);
  Share* share = find(user);
  if (share != nullptr && --share->connections == 0) *share = users_[--count_];
}

uid_t UserShares::heaviest() noexcept {
  const LockHold hold(lock_);
  const Share* const most = std::max_element(users_, users_ + count_, [](const Share& left, const Share& right) {
    return left.connections < right.connections;
  });
  return most != users_ + count_ ? most->user : static_cast<uid_t>(-1);
}

}  // namespace quorvel::platform::host
