// A recording of a telephony service: one JSON dictionary a line, in the order in which things happened.
//
//   "time"   date   when it arrived
//   "event"  text   the notification's name; absent for a state alone, which opens a connection
//   "state"  the whole state from then on
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "property/value.h"

namespace quorvel::tools {

inline constexpr std::string_view kRecordTime = "time";
inline constexpr std::string_view kRecordEvent = "event";
inline constexpr std::string_view kRecordState = "state";

struct RecordedStep {
  double time = 0;      // seconds, as dates have them; never less than that of the step before
  std::string event;    // empty for a state alone
  PropertyValue state;  // a dictionary
};

/// The steps in the file `path`, an ordinary path. Throws Failure with `status`, which names the line, for a file that
/// cannot be read or is no recording.
[[nodiscard]] std::vector<RecordedStep> read_recording(const std::string& path, int status);

}  // namespace quorvel::tools
