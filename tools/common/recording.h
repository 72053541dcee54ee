// A recording of a telephony service: one JSON dictionary a line, in the order in which things happened.
//
//   "time"   date   when it arrived
//   "event"  text   the notification's name; absent for a state alone, which opens a connection
//   "state"  the whole state from then on
#pragma once

#include <string_view>

namespace quorvel::tools {

inline constexpr std::string_view kRecordTime = "time";
inline constexpr std::string_view kRecordEvent = "event";
inline constexpr std::string_view kRecordState = "state";

}  // namespace quorvel::tools
