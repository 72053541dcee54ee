// The telephony service's state as it travels: a dictionary in which each field of the table below is a dictionary with
// up to three entries, all optional: "Value", and the error pair "Domain" and "Code" (integers, 0 when absent). The
// field "sim-status" carries a value only, the field "connection" an error pair only. A field that is absent has no
// value and no error. Commands to the service are calls named below.
#pragma once

#include <algorithm>
#include <array>
#include <cstdint>
#include <iterator>
#include <string_view>

#include "platform/telephony.h"
#include "property/value.h"

namespace quorvel::wire {

using platform::kBootloaderVersionField;
using platform::kFirmwareVersionField;
using platform::kGid1Field;
using platform::kGid2Field;
using platform::kIccidField;
using platform::kImsiField;
using platform::kPostponementField;
inline constexpr StaticText kSimStatusField = "sim-status";
inline constexpr StaticText kConnectionField = "connection";

/// Every field, in the order in which people are shown them: those that queries ask for stand between the other two.
inline constexpr auto kStateFields = [] {
  std::array<std::string_view, std::size(platform::kTelephonyFields) + 2> fields = {};
  fields.front() = kSimStatusField.text();
  std::transform(std::begin(platform::kTelephonyFields), std::end(platform::kTelephonyFields), fields.begin() + 1,
                 [](const platform::TelephonyFieldRow& row) { return row.name; });
  fields.back() = kConnectionField.text();
  return fields;
}();

inline constexpr StaticText kStateValueKey = "Value";
inline constexpr StaticText kStateDomainKey = "Domain";
inline constexpr StaticText kStateCodeKey = "Code";

/// SIM statuses: a card that works; an empty tray; a card that waits for its PIN or its PUK; a card or modem with
/// another lock; a card that does not work.
inline constexpr StaticText kSimStatusReady = "Ready";
inline constexpr StaticText kSimStatusNotInserted = "NotInserted";
inline constexpr StaticText kSimStatusPinRequired = "PinRequired";
inline constexpr StaticText kSimStatusPukRequired = "PukRequired";
inline constexpr StaticText kSimStatusLocked = "Locked";
inline constexpr StaticText kSimStatusFailed = "Failed";

/// Every notification that a service sends.
inline constexpr std::string_view kTelephonyNotifications[] = {
    platform::kSimNewlyInserted.text(),
    platform::kSimStatusChanged.text(),
    platform::kPhoneNumberChanged.text(),
    platform::kPostponementStatusChanged.text(),
};

/// The events that an observer is sent behind its first state, once the service has told anybody anything: each kind of
/// baseband has its facts collected on one of them.
inline constexpr std::string_view kCatchUpEvents[] = {
    platform::kSimStatusChanged.text(),
    platform::kPostponementStatusChanged.text(),
};

[[nodiscard]] constexpr bool is_telephony_notification(std::string_view name) noexcept {
  return std::find(std::begin(kTelephonyNotifications), std::end(kTelephonyNotifications), name) !=
         std::end(kTelephonyNotifications);
}

// Commands are calls on the service's socket, answered in turn: with the state (show), with the observers (notify),
// with no value (the others), or with a failure. A connection that has made a call is sent replies only, no events.
//
//   command  argument, a dictionary                  effect
//   show     none                                    the reply is the state
//   set      "Field", "Value" (absent: no value)     the field has the value; nobody is told
//   fail     "Field", "Domain", "Code" (int32)       the field has the error pair, beside its value
//   succeed  "Field"                                 the field has no error pair
//   notify   "Name", "Count" (default 1)             sends the event so many times; answered once every observer has
//                                                    taken it, up to a bounded rest
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
