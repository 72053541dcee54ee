// The telephony state that a modem makes. Pure functions.
#pragma once

#include <string>

#include "bridge/reading.h"
#include "property/value.h"

namespace quorvel::bridge {

/// Error pairs: the bridge's own findings in domain 1, and the errno of a failed question to the modem service in
/// domain 2.
inline constexpr int kFindingDomain = 1;
inline constexpr int kQuestionDomain = 2;
enum Finding : int { kNoModem = 1, kCardLocked, kCardUnreadable, kModemStarting, kNotRunning, kBusLost };

/// The SIM status of `modem`, empty when it has none to tell.
[[nodiscard]] std::string sim_status(const Modem& modem);
/// True for a status that says that a card is in the tray.
[[nodiscard]] bool is_card_present(const std::string& status);

/// The state of `modem`, one of the reading's, or of no modem (null). `keeps_imsi`: the subscriber told last belongs to
/// this card, or nobody can say. Null when memory runs out.
[[nodiscard]] PropertyValue state_of(const Reading& reading, const Modem* modem, bool keeps_imsi);

}  // namespace quorvel::bridge
