#include "telephony_look.h"

#include <utility>

#include "client/core/connection.h"
#include "daemon_process.h"
#include "platform/telephony.h"
#include "wire/telephony_answers.h"
#include "wire/telephony_state.h"

namespace quorvel::tools {
namespace {

constexpr int kPatience = 200;  // milliseconds

PropertyValue first_state() {
  const client::Moment deadline = client::moment_after(kPatience);
  client::Connection connection;
  client::Failure failure;
  if (!connection.open(nullptr, "telvane", {}, wire::kMaximumStateBody, failure)) return {};
  while (client::moment_now() < deadline) {
    wire::Frame frame;
    switch (connection.step(frame, failure)) {
      case client::Progress::failed: return {};
      case client::Progress::waiting: client::sleep_until_due(connection.wait(), deadline); break;
      case client::Progress::done: return wire::state_of(frame);
    }
  }
  return {};
}

}  // namespace

void look_at_telephony() {
  const Server service = server_of("telvane");
  platform::keep_telephony_state(is_believed(service) ? first_state() : PropertyValue());
}

}  // namespace quorvel::tools
