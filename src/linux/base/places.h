// The places that connections to one service take, and who holds them. When places run out, whoever holds most of them
// gives way first, so that no user can take the places of all the others, however many programs of theirs ask. The same
// goes for the bytes that connections hold. The daemon's clients, its observers and the telephony service's peers each
// have places of this kind; which connection of that user gives way is for their server to say.
#pragma once

#include <sys/types.h>

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <cstdlib>

#include "linux/base/attached_descriptors.h"
#include "platform/lock.h"

namespace quorvel::platform::host {

/// A process at the other end of a local socket, as the kernel knew it when it connected.
struct Peer {
  uid_t user = static_cast<uid_t>(-1);
  pid_t process = 0;
};

/// Whom a connected local socket leads to. One that the kernel does not tell belongs to a user of its own, -1.
[[nodiscard]] Peer peer_of(int socket) noexcept;

/// Any thread may call everything here.
class Places {
 public:
  /// `limit` tells how many connections there may be, whenever that is asked; `held_limit` is how many bytes all of
  /// them together may hold.
  explicit Places(std::size_t (*limit)() noexcept, std::size_t held_limit = 0) noexcept
      : limit_(limit), held_limit_(held_limit) {}
  Places(const Places&) = delete;
  Places& operator=(const Places&) = delete;
  ~Places() { std::free(users_); }

  /// Gives a connection of `user` a place, also when there is none left: somebody then gives way, the newcomer perhaps.
  /// Returns how many places the user holds now, or 0, and none was given, when memory runs out.
  [[nodiscard]] std::size_t take(uid_t user) noexcept;
  /// Takes a place back that `take` gave; its connection holds no bytes any more.
  void give_back(uid_t user) noexcept;

  /// Bounds what the kernel keeps for a connection that does not read: the one with which its user holds `held` places.
  void bound_send_room(int socket, std::size_t held) const noexcept;

  /// True while there are more connections than there may be.
  [[nodiscard]] bool are_overfull() const noexcept { return count_.load(std::memory_order_relaxed) > limit_(); }
  /// True while one more may be let in before somebody else has given way, for whom the reserve of descriptors
  /// suffices.
  [[nodiscard]] bool bear_one_more() const noexcept {
    return count_.load(std::memory_order_relaxed) + closing_connections() < limit_() + kAboveLimit;
  }
  /// The user who holds most places; -1 when nobody holds any.
  [[nodiscard]] uid_t heaviest() noexcept;

  /// Notes that a connection of `user`, which has a place, holds `now` bytes instead of `before`.
  void hold(uid_t user, std::size_t before, std::size_t now) noexcept;
  /// True while connections hold more bytes than they may.
  [[nodiscard]] bool hold_too_much() const noexcept { return held_.load(std::memory_order_relaxed) > held_limit_; }
  /// The user whose connections hold most bytes; -1 when nobody holds any.
  [[nodiscard]] uid_t greediest() noexcept;

 private:
  static constexpr std::size_t kAboveLimit = 4;

  struct Share {
    uid_t user;
    std::size_t connections;
    std::size_t held;
  };

  [[nodiscard]] Share* find(uid_t user) noexcept QUORVEL_REQUIRES(lock_);
  [[nodiscard]] uid_t largest(std::size_t Share::*amount) noexcept;

  std::size_t (*limit_)() noexcept;
  std::size_t held_limit_;
  std::atomic<std::size_t> count_ = 0;
  std::atomic<std::size_t> held_ = 0;
  Lock lock_;
  Share* users_ QUORVEL_GUARDED_BY(lock_) = nullptr;  // those with a connection, in no order
  std::size_t user_count_ QUORVEL_GUARDED_BY(lock_) = 0;
  std::size_t capacity_ QUORVEL_GUARDED_BY(lock_) = 0;
};

}  // namespace quorvel::platform::host
