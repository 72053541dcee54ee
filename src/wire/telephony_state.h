// The telephony service's state as it travels: a dictionary in which each field of the table below is a dictionary with
// up to three entries, all optional: "Value", and the error pair "Domain" and "Code" (integers, 0 when absent). The
// field "sim-status" carries a value only, the field "connection" an error pair only. A field that is absent has no
// value and no error. Commands to the service are calls named below.
#pragma once

#include <cstdint>
#include <string_view>

#include "property/value.h"

namespace quorvel::wire {

inline constexpr StaticText kSimStatusField = "sim-status";
inline constexpr StaticText kIccidField = "iccid";
inline constexpr StaticText kImsiField = "imsi";
inline constexpr StaticText kFirmwareVersionField = "firmware-version";
inline constexpr StaticText kBootloaderVersionField = "bootloader-version";
inline constexpr StaticText kGid1Field = "gid1";
inline constexpr StaticText kGid2Field = "gid2";
inline constexpr StaticText kPostponementField = "postponement";
inline constexpr StaticText kConnectionField = "connection";

/// Every field, in the order in which people are shown them.
inline constexpr std::string_view kStateFields[] = {
    kSimStatusField.text(),         kIccidField.text(), kImsiField.text(), kFirmwareVersionField.text(),
    kBootloaderVersionField.text(), kGid1Field.text(),  kGid2Field.text(), kPostponementField.text(),
    kConnectionField.text(),
};

inline constexpr StaticText kStateValueKey = "Value";
inline constexpr StaticText kStateDomainKey = "Domain";
inline constexpr StaticText kStateCodeKey = "Code";

/// SIM statuses that a service reports for a card that works and for an empty tray.
inline constexpr StaticText kSimStatusReady = "Ready";
inline constexpr StaticText kSimStatusNotInserted = "NotInserted";

// Commands are calls on the service's socket, answered in turn: with the state (show), with the observers (notify),
// with no value (the others), or with a failure. A connection that has made a call is sent replies only, no events.
//
//   command  argument, a dictionary                  effect
//   show     none                                    the reply is the state
//   set      "Field", "Value" (absent: no value)     the field has the value; nobody is told
//   fail     "Field", "Domain", "Code" (int32)       the field has the error pair, beside its value
//   succeed  "Field"                                 the field has no error pair
//   notify   "Name", "Count" (default 1)             sends the event so many times; answered when those who observe
//   have
//                                                    taken what was sent, up to a bounded rest
inline constexpr std::string_view kShowCommand = "show";
inline constexpr std::string_view kSetCommand = "set";
inline constexpr std::string_view kFailCommand = "fail";
inline constexpr std::string_view kSucceedCommand = "succeed";
inline constexpr std::string_view kNotifyCommand = "notify";

inline constexpr StaticText kCommandFieldKey = "Field";
inline constexpr StaticText kCommandNameKey = "Name";
inline constexpr StaticText kCommandCountKey = "Count";

/// In the reply to notify: how many observers there are at its end, and how many were cut off meanwhile.
inline constexpr StaticText kReplyObserversKey = "Observers";
inline constexpr StaticText kReplyCutOffKey = "CutOff";

/// The largest state that is taken from the service; the rest of a connection that sends more is not read.
inline constexpr std::uint32_t kMaximumStateBody = 256u << 20;

}  // namespace quorvel::wire
