// What observers are told, and when: from readings and the memory of the last telling. Pure: time is passed in.
#pragma once

#include <chrono>
#include <optional>
#include <string>
#include <vector>

#include "bridge/reading.h"
#include "property/value.h"

namespace quorvel::bridge {

/// The state to serve from now on, none to leave it as it is; the events to send with it, in this order; and lines for
/// the log.
struct Telling {
  PropertyValue state;
  std::vector<std::string> events;
  std::vector<std::string> lines;
};

class Facts {
 public:
  using Clock = std::chrono::steady_clock;

  /// `pinned`: the one device to follow, empty for the best. `shows_identities`: the log names them in full.
  explicit Facts(std::string pinned = {}, bool shows_identities = false)
      : pinned_(std::move(pinned)), shows_identities_(shows_identities) {}

  [[nodiscard]] Telling take(Reading reading, Clock::time_point now);
  /// When the last reading is to be taken again, because it has been waited for long enough.
  [[nodiscard]] std::optional<Clock::time_point> deadline() const { return deadline_; }
  [[nodiscard]] Telling take_again(Clock::time_point now) { return take(std::move(reading_), now); }

 private:
  [[nodiscard]] const Modem* find_chosen() const;
  [[nodiscard]] const Modem* find_best() const;
  [[nodiscard]] bool keeps_imsi(const Modem* modem) const;
  [[nodiscard]] Telling wait(const Modem* modem, Clock::time_point now);
  [[nodiscard]] Telling tell(const Modem* modem);
  [[nodiscard]] std::vector<std::string> events(const PropertyValue& state, const Modem* modem,
                                                const std::string& status) const;
  [[nodiscard]] std::string missing() const;
  [[nodiscard]] std::string choice(const Modem* modem) const;
  [[nodiscard]] std::string others_than(const Modem* modem) const;
  [[nodiscard]] std::string told_line(const Telling& telling, const Modem* modem, const std::string& status) const;
  void remember(const PropertyValue& state, const Modem* modem, const std::string& status);

  std::string pinned_;
  bool shows_identities_;
  Reading reading_;
  std::string chosen_;  // the device of the modem that was told last
  std::string others_;  // modems that are not followed, as the log named them last
  std::optional<Clock::time_point> deadline_;

  PropertyValue told_;  // the last told state, none before the first
  std::string told_status_;
  std::string known_card_;  // the ICCID told last, empty after a removal
  std::string imsi_card_;   // the ICCID of the card whose IMSI was told last
  std::vector<std::string> told_numbers_;
};

}  // namespace quorvel::bridge
