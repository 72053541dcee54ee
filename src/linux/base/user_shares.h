// Who holds how much of what is short. When connections run out, whoever holds most of them gives way first, so that no
// user can take the places of all the others, however many programs of theirs ask.
#pragma once

#include <sys/types.h>

#include <cstddef>
#include <cstdlib>

#include "platform/lock.h"

namespace quorvel::platform::host {

/// A process at the other end of a local socket, as the kernel knew it when it connected.
struct Peer {
  uid_t user = static_cast<uid_t>(-1);
  pid_t process = 0;
};

/// Whom a connected local socket leads to. One that the kernel does not tell belongs to a user of its own, -1.
[[nodiscard]] Peer peer_of(int socket) noexcept;

/// Counts the connections of each user. Any thread may call everything here.
class UserShares {
 public:
  UserShares() noexcept = default;
  UserShares(const UserShares&) = delete;
  UserShares& operator=(const UserShares&) = delete;
  ~UserShares() { std::free(users_); }

  /// Counts one connection more of `user`. Returns how many they are now, or 0, and nothing is counted, when memory
  /// runs out.
  [[nodiscard]] std::size_t add(uid_t user) noexcept;
  /// Counts one less; `add` has counted it.
  void remove(uid_t user) noexcept;
  /// The user who holds most; -1 when nobody holds anything.
  [[nodiscard]] uid_t heaviest() noexcept;

 private:
  struct Share {
    uid_t user;
    std::size_t connections;
  };

  [[nodiscard]] Share* find(uid_t user) noexcept QUORVEL_REQUIRES(lock_);

  Lock lock_;
  Share* users_ QUORVEL_GUARDED_BY(lock_) = nullptr;  // those with a connection, in no order
  std::size_t count_ QUORVEL_GUARDED_BY(lock_) = 0;
  std::size_t capacity_ QUORVEL_GUARDED_BY(lock_) = 0;
};

}  // namespace quorvel::platform::host
