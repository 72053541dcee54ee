#include "linux/ipc/ipc_stages.h"

#include <algorithm>
#include <limits>

namespace quorvel::platform::host {

namespace {

using Stage = IpcConnection::Stage;

struct Limit {
  Stage stage;
  std::int64_t milliseconds;
};
constexpr Limit kLimits[] = {{Stage::partial, 10'000}, {Stage::sending, 30'000}};

// A connection without a call is given this long for its first one before it gives way to others.
constexpr std::int64_t kUnusedMilliseconds = 100;

}  // namespace

void IpcStages::move(IpcConnection& connection, Stage stage, std::int64_t now) noexcept {
  connection.stage = stage;
  connection.since = now;
  list_of(stage).push_back(&connection);
}

IpcConnection* IpcStages::oldest(Stage stage, uid_t user) const noexcept {
  const ConnectionList& list = list_of(stage);
  IpcConnection* connection = list.front();
  while (connection != nullptr && connection->peer().user != user) connection = list.after(connection);
  return connection;
}

std::int64_t IpcStages::due() const noexcept {
  std::int64_t due = std::numeric_limits<std::int64_t>::max();
  for (const Limit& limit : kLimits) {
    if (const IpcConnection* first = oldest(limit.stage)) due = std::min(due, first->since + limit.milliseconds);
  }
  return due;
}

IpcConnection* IpcStages::overdue(std::int64_t now) const noexcept {
  for (const Limit& limit : kLimits) {
    IpcConnection* const first = oldest(limit.stage);
    if (first != nullptr && first->since + limit.milliseconds <= now) return first;
  }
  return nullptr;
}

IpcConnection* IpcStages::first_to_give_way(uid_t user, std::int64_t now) const noexcept {
  IpcConnection* const unused = oldest(Stage::fresh, user);
  if (unused != nullptr && unused->since + kUnusedMilliseconds <= now) return unused;
  for (const Stage stage : {Stage::idle, Stage::partial, Stage::sending}) {
    if (IpcConnection* connection = oldest(stage, user)) return connection;
  }
  return unused;
}

}  // namespace quorvel::platform::host
