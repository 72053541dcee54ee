#include "sim_record.h"

#include <fcntl.h>
#include <unistd.h>

#include <chrono>
#include <thread>

#include "client/core/connection.h"
#include "common/failure.h"
#include "common/json.h"
#include "common/recording.h"
#include "files.h"
#include "output.h"
#include "platform/descriptor.h"
#include "property/binary/binary.h"
#include "wire/telephony_state.h"

namespace quorvel::tools {
namespace {

using namespace std::chrono_literals;

constexpr auto kRetryInterval = 200ms;

// The line for a frame; throws Failure for one that no telephony service sends.
std::string line_of(const wire::Frame& frame) {
  const bool is_event = frame.head.kind == wire::FrameKind::event;
  const PropertyValue state = read_binary(frame.payload, Mutability::immutable);
  if (!state.is_dictionary() || (!is_event && frame.head.kind != wire::FrameKind::state)) {
    throw Failure{kUnreachable, "the telephony service sent something that is neither a state nor an event"};
  }
  PropertyValue line = PropertyValue::dictionary(3);
  put(line, kRecordTime, PropertyValue::date(seconds_now()));
  if (is_event) put(line, kRecordEvent, PropertyValue::string(frame.name));
  put(line, kRecordState, state);
  return to_json(line, -1) + '\n';
}

// Records one connection until it ends, and returns why it did.
client::Failure record_connection(const Descriptor& file, const std::string& path) {
  client::Connection connection;
  client::Failure failure;
  if (!connection.open(nullptr, "telvane", {}, wire::kMaximumStateBody, failure)) return failure;
  for (bool first = true;;) {
    wire::Frame frame;
    switch (connection.step(frame, failure)) {
      case client::Progress::failed: return failure;
      case client::Progress::waiting: client::sleep_until_due(connection.wait()); break;
      case client::Progress::done:
        if (std::exchange(first, false)) note("recording; Ctrl-C ends it");
        write_all(file.get(), line_of(frame), path, Place::anywhere);
    }
  }
}

}  // namespace

int record_service(const std::string& path) {
  const bool standard = path == "-";
  // It names people's cards.
  const Descriptor file(standard ? ::dup(STDOUT_FILENO)
                                 : ::open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC | O_CLOEXEC | O_NOCTTY, 0600));
  if (!file) fail_on("create", path, Place::anywhere);
  end_when_interrupted();
  for (bool told = false;; std::this_thread::sleep_for(kRetryInterval)) {
    const client::Failure failure = record_connection(file, path);
    const bool comes_back =
        failure.code == client::ErrorCode::service_absent || failure.code == client::ErrorCode::disconnected;
    if (!comes_back) throw Failure{kUnreachable, std::string("the telephony service: ") + failure.sentence};
    const bool ended = failure.code == client::ErrorCode::disconnected;
    if (ended) note("the telephony service is gone; waiting for it to come back");
    if (!ended && !told) note("no telephony service is there; waiting for one");
    told = true;
  }
}

}  // namespace quorvel::tools
