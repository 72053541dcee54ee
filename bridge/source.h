// ModemManager, read over D-Bus. Nothing is called that changes a modem, and reading never starts ModemManager.
#pragma once

#include <poll.h>
#include <systemd/sd-bus.h>

#include <chrono>
#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <utility>

#include "bridge/reading.h"

namespace quorvel::bridge {

class ModemManagerSource {
 public:
  using Clock = std::chrono::steady_clock;

  ModemManagerSource() = default;
  ModemManagerSource(const ModemManagerSource&) = delete;
  ModemManagerSource& operator=(const ModemManagerSource&) = delete;
  ~ModemManagerSource() { close(); }

  /// What to poll for; when to call `serve` at the latest, none when only the descriptor matters.
  [[nodiscard]] pollfd wait() const;
  [[nodiscard]] std::optional<Clock::time_point> deadline() const;
  /// Goes on with whatever is due. Returns a reading when a new one is complete.
  [[nodiscard]] std::optional<Reading> serve();
  /// What there is to say about the bus and the readings, empty when there is nothing new; to be asked after `serve`.
  [[nodiscard]] std::string take_trouble() { return std::exchange(trouble_, {}); }

 private:
  static int on_message(sd_bus_message* message, void* context, sd_bus_error* error);
  static int on_signal(sd_bus_message* message, void* context, sd_bus_error* error);
  static int on_objects(sd_bus_message* message, void* context, sd_bus_error* error);
  static int on_card(sd_bus_message* message, void* context, sd_bus_error* error);

  [[nodiscard]] int open();
  void close();
  void lose_bus(int error);
  void connect_anew();
  [[nodiscard]] int process();
  void mark_stale();
  [[nodiscard]] int start_reading();
  [[nodiscard]] int take_objects(sd_bus_message* message);
  [[nodiscard]] int ask_card(const std::string& path, std::size_t modem);
  [[nodiscard]] int call(sd_bus_message* message, sd_bus_message_handler_t answered, std::uint64_t& serial);
  void fail_reading(const std::string& reason, int error);
  void finish_reading();
  void say(const std::string& trouble);

  sd_bus* bus_ = nullptr;
  Clock::time_point open_at_ = Clock::now();
  std::chrono::milliseconds open_delay_{100};

  bool has_message_ = false;                       // one came whole
  std::optional<Clock::time_point> first_signal_;  // of those since the last reading began
  std::optional<Clock::time_point> read_at_;
  std::chrono::seconds retry_delay_{1};
  bool is_reading_ = false;
  bool is_stale_ = false;  // a signal came while the reading was on its way
  bool is_mute_ = false;   // a call got no answer in time
  Reading reading_;
  std::optional<Reading> disturbed_;  // the last reading, when it was stale
  // The calls on their way, by serial: for the modems, and for each one's card with the modem's place. An answer to any
  // other call belongs to a reading that was given up.
  std::uint64_t objects_call_ = 0;
  std::map<std::uint64_t, std::size_t> card_calls_;
  std::optional<Reading> complete_;
  Reach last_reach_ = Reach::bus_lost;
  std::string trouble_;
  std::string said_;  // the trouble that lasts
};

}  // namespace quorvel::bridge
