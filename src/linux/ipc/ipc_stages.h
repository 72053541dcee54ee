// The stages that the connections of one worker are in, and how long each may last. On the worker's thread only.
#pragma once

#include <sys/types.h>

#include <cstddef>
#include <cstdint>

#include "linux/base/intrusive_list.h"
#include "linux/ipc/ipc_connection.h"

namespace quorvel::platform::host {

// From stage to stage: the worker's `serve` moves a connection on when its socket is ready, `serve_ready` when its turn
// has come, `close` from anywhere. A stage that has a limit ends with the connection's end when the limit is over. A
// connection that gives way to others does so in the order of `first_to_give_way`.
//
//   stage    waits for                         and is then       limit
//   fresh    the first byte of its first call  idle, or below
//   idle     the first byte of a call          partial, ready
//   partial  the rest of a call                ready, idle       10 s from the first byte
//   ready    its turn                          idle, or below
//   sending  the client, to take the reply     idle, or below    30 s from the reply's first byte
//   closed   the end of the batch of events    freed
class IpcStages {
 public:
  using Stage = IpcConnection::Stage;
  using ConnectionList = IntrusiveList<IpcConnection>;

  /// Puts `connection` at the end of a stage, in which it is since `now`.
  void move(IpcConnection& connection, Stage stage, std::int64_t now) noexcept;

  [[nodiscard]] bool has(Stage stage) const noexcept { return !list_of(stage).empty(); }
  /// The connection that has been in a stage for longest, or null; with `user`, of those that belong to that user.
  [[nodiscard]] IpcConnection* oldest(Stage stage) const noexcept { return list_of(stage).front(); }
  [[nodiscard]] IpcConnection* oldest(Stage stage, uid_t user) const noexcept;
  /// Takes all connections out of a stage.
  void take_all(Stage stage, ConnectionList& out) noexcept { out.take_all(list_of(stage)); }

  /// When the next limit is over, in milliseconds of the monotonic clock; the largest number when none runs.
  [[nodiscard]] std::int64_t due() const noexcept;
  /// A connection whose limit is over at `now`, or null.
  [[nodiscard]] IpcConnection* overdue(std::int64_t now) const noexcept;

  /// Of the connections of `user`, the one that is missed least: one that has been there for a while without a call,
  /// then the one that has been idle longest, then one in the middle of a call or a reply, and one that has just come
  /// last. Null when the user has none here.
  [[nodiscard]] IpcConnection* first_to_give_way(uid_t user, std::int64_t now) const noexcept;

 private:
  [[nodiscard]] ConnectionList& list_of(Stage stage) noexcept { return lists_[static_cast<std::size_t>(stage)]; }
  [[nodiscard]] const ConnectionList& list_of(Stage stage) const noexcept {
    return lists_[static_cast<std::size_t>(stage)];
  }

  ConnectionList lists_[static_cast<std::size_t>(Stage::closed) + 1];
};

}  // namespace quorvel::platform::host
