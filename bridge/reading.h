// What a modem service was last seen to say, in nobody's words in particular: the seam between a source, which fills
// it, and the facts that are told.
#pragma once

#include <string>
#include <vector>

namespace quorvel::bridge {

enum class Reach {
  bus_lost,
  not_running,
  refused,  ///< the service is there, and what it was asked fails
  running
};
enum class ModemState { starting, running, no_card, card_error, failed };
/// `none` includes locks that do not keep the card from working.
enum class CardLock { unknown, none, pin, puk, other };

struct Modem {
  std::string device;  ///< the physical device: the same through swaps and re-probing
  ModemState state = ModemState::starting;
  unsigned failure = 0;  ///< the source's number of the reason, for `failed` and `card_error`
  CardLock lock = CardLock::unknown;
  bool has_card = false;
  std::string iccid, imsi, revision, imei;  ///< empty when unknown
  std::string gid1, gid2;                   ///< bytes; empty when there are none
  std::vector<std::string> numbers;
  bool operator==(const Modem&) const = default;
};

struct Reading {
  Reach reach = Reach::not_running;
  std::vector<Modem> modems;
  int error = 0;  ///< errno of what failed, for `refused`
  bool operator==(const Reading&) const = default;
};

}  // namespace quorvel::bridge
