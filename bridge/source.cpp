#include "bridge/source.h"

#include <sys/ioctl.h>

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <memory>
#include <vector>

#include "bridge/properties.h"

namespace quorvel::bridge {
namespace {

constexpr const char* kName = "org.freedesktop.ModemManager1";
constexpr const char* kPath = "/org/freedesktop/ModemManager1";
constexpr const char* kModem = "org.freedesktop.ModemManager1.Modem";
constexpr const char* kSim = "org.freedesktop.ModemManager1.Sim";
constexpr const char* kProperties = "org.freedesktop.DBus.Properties";
constexpr const char* kObjectManager = "org.freedesktop.DBus.ObjectManager";
constexpr const char* kMatches[] = {
    "type='signal',sender='org.freedesktop.ModemManager1',path_namespace='/org/freedesktop/ModemManager1'",
    "type='signal',sender='org.freedesktop.DBus',interface='org.freedesktop.DBus',member='NameOwnerChanged',"
    "arg0='org.freedesktop.ModemManager1'",
};

// Signals come in bursts: a reading begins when none came for a while, but no later than the bound.
constexpr auto kQuiet = std::chrono::milliseconds(250);
constexpr auto kLongestBurst = std::chrono::seconds(2);
constexpr std::uint64_t kCallMicroseconds = 5'000'000;
constexpr auto kLongestRetry = std::chrono::seconds(30);
constexpr auto kFirstOpenDelay = std::chrono::milliseconds(100);
constexpr auto kLongestOpenDelay = std::chrono::milliseconds(5000);
constexpr std::size_t kMostModems = 32;
constexpr int kMostMessages = 100;

struct Unref {
  void operator()(sd_bus_message* message) const { sd_bus_message_unref(message); }
};
using Message = std::unique_ptr<sd_bus_message, Unref>;

// Does a PropertiesChanged name anything that a reading holds, with a new value or without? One that cannot be read
// counts as if it did.
bool has_relevant_change(sd_bus_message* message) {
  const char* interface = nullptr;
  if (sd_bus_message_read_basic(message, 's', &interface) < 0) return true;
  if (std::string_view(interface) == kSim) return true;
  if (std::string_view(interface) != kModem) return false;
  bool found = false;
  const int result = each_property(message, [&](std::string_view name, std::string_view) {
    found |= is_modem_property(name);
    return 0;
  });
  if (found || result < 0) return true;
  return each_text(message, [&](std::string_view name) { found |= is_modem_property(name); }) < 0 || found;
}

// An interface of a modem that goes or comes matters only when it is the modem's own. A message that cannot be read
// counts as if it were.
bool names_modem(sd_bus_message* message, bool is_added) {
  bool found = false;
  int result = sd_bus_message_skip(message, "o");
  if (result >= 0 && is_added) {
    result = each_interface(message, [&](std::string_view name) {
      found |= name == kModem;
      return 0;
    });
  } else if (result >= 0) {
    result = each_text(message, [&](std::string_view name) { found |= name == kModem; });
  }
  return found || result < 0;
}

bool is_relevant(sd_bus_message* message) {
  const char* member = sd_bus_message_get_member(message);
  const std::string_view name(member != nullptr ? member : "");
  if (name == "PropertiesChanged") return has_relevant_change(message);
  if (name == "InterfacesAdded" || name == "InterfacesRemoved") return names_modem(message, name == "InterfacesAdded");
  return name == "StateChanged" || name == "NameOwnerChanged";
}

bool says_not_running(const sd_bus_error& error) {
  return sd_bus_error_has_name(&error, SD_BUS_ERROR_SERVICE_UNKNOWN) != 0 ||
         sd_bus_error_has_name(&error, SD_BUS_ERROR_NAME_HAS_NO_OWNER) != 0;
}

std::uint64_t serial_of_call(sd_bus_message* answer) {
  std::uint64_t serial = 0;
  return sd_bus_message_get_reply_cookie(answer, &serial) < 0 ? 0 : serial;
}

std::string text_of(const sd_bus_error& error) {
  return std::string(error.name != nullptr ? error.name : "an error") + ": " +
         (error.message != nullptr ? error.message : "");
}

}  // namespace

int ModemManagerSource::open() {
  int result = sd_bus_open_system(&bus_);
  if (result >= 0) result = sd_bus_add_filter(bus_, nullptr, on_message, this);
  for (const char* match : kMatches) {
    if (result >= 0) result = sd_bus_add_match_async(bus_, nullptr, match, on_signal, nullptr, this);
  }
  if (result >= 0) read_at_ = Clock::now();
  return result;
}

void ModemManagerSource::close() {
  if (bus_ != nullptr) sd_bus_close_unref(bus_);
  bus_ = nullptr;
  is_reading_ = is_mute_ = false;
  objects_call_ = 0;
  card_calls_.clear();
  disturbed_.reset();
  read_at_.reset();
  first_signal_.reset();
}

void ModemManagerSource::lose_bus(int error) {
  say(std::string(bus_ == nullptr ? "there is no bus: " : "the bus is lost: ") + std::strerror(-error));
  close();
  complete_ = Reading{Reach::bus_lost, {}, 0};
  last_reach_ = Reach::bus_lost;
  open_at_ = Clock::now() + open_delay_;
  open_delay_ = std::min(open_delay_ * 2, kLongestOpenDelay);
}

// An answer that does not come may be behind a message that never ends, which only another connection gets round.
void ModemManagerSource::connect_anew() {
  const auto read_at = read_at_;
  close();
  if (const int result = open(); result < 0) return lose_bus(result);
  read_at_ = read_at;
}

pollfd ModemManagerSource::wait() const {
  if (bus_ == nullptr) return {-1, 0, 0};
  const int events = sd_bus_get_events(bus_);
  return {sd_bus_get_fd(bus_), static_cast<short>(events < 0 ? 0 : events), 0};
}

std::optional<ModemManagerSource::Clock::time_point> ModemManagerSource::deadline() const {
  if (bus_ == nullptr) return open_at_;
  std::optional<Clock::time_point> result = is_reading_ ? std::nullopt : read_at_;
  std::uint64_t microseconds = 0;
  if (sd_bus_get_timeout(bus_, &microseconds) >= 0 && microseconds != UINT64_MAX) {
    // On CLOCK_MONOTONIC, as the steady clock is.
    const Clock::time_point bus{std::chrono::microseconds(microseconds)};
    result = result ? std::min(*result, bus) : bus;
  }
  return result;
}

// Takes so many messages at most, because a bus that never stops talking keeps nobody from being served.
int ModemManagerSource::process() {
  int result = 1;
  for (int turn = 0; turn < kMostMessages && bus_ != nullptr && result > 0; ++turn) {
    int bytes = 0;
    static_cast<void>(::ioctl(sd_bus_get_fd(bus_), FIONREAD, &bytes));
    // Answers to calls do not count as messages, and while they are awaited their time limit is guard enough.
    const bool is_watched = bytes > 0 && !is_reading_ && sd_bus_is_ready(bus_) > 0;
    has_message_ = false;
    result = sd_bus_process(bus_, nullptr);
    // A message has begun, and may never end: a reading finds out.
    if (is_watched && !has_message_) mark_stale();
  }
  return result;
}

std::optional<Reading> ModemManagerSource::serve() {
  if (bus_ == nullptr && Clock::now() >= open_at_) {
    if (const int result = open(); result < 0) lose_bus(result);
  }
  if (const int result = process(); result < 0) lose_bus(result);
  if (is_mute_) connect_anew();
  if (bus_ != nullptr && !is_reading_ && read_at_ && Clock::now() >= *read_at_) {
    if (const int started = start_reading(); started < 0) lose_bus(started);
  }
  return std::exchange(complete_, std::nullopt);
}

void ModemManagerSource::mark_stale() {
  const auto now = Clock::now();
  if (!first_signal_) first_signal_ = now;
  read_at_ = std::min(now + kQuiet, *first_signal_ + kLongestBurst);
  is_stale_ = is_reading_;
}

int ModemManagerSource::on_signal(sd_bus_message* message, void* context, sd_bus_error* /*error*/) {
  if (is_relevant(message)) static_cast<ModemManagerSource*>(context)->mark_stale();
  return 0;
}

int ModemManagerSource::on_message(sd_bus_message* /*message*/, void* context, sd_bus_error* /*error*/) {
  static_cast<ModemManagerSource*>(context)->has_message_ = true;
  return 0;
}

int ModemManagerSource::start_reading() {
  sd_bus_message* call = nullptr;
  int result = sd_bus_message_new_method_call(bus_, &call, kName, kPath, kObjectManager, "GetManagedObjects");
  const Message owner(call);
  if (result >= 0) result = this->call(call, on_objects, objects_call_);
  if (result < 0) return result;
  read_at_.reset();
  first_signal_.reset();
  is_stale_ = false;
  is_reading_ = true;
  reading_ = {Reach::running, {}, 0};
  card_calls_.clear();
  return 0;
}

int ModemManagerSource::call(sd_bus_message* message, sd_bus_message_handler_t answered, std::uint64_t& serial) {
  int result = sd_bus_message_set_auto_start(message, 0);
  if (result >= 0) result = sd_bus_call_async(bus_, nullptr, message, answered, this, kCallMicroseconds);
  if (result >= 0) result = sd_bus_message_get_cookie(message, &serial);
  return result;
}

int ModemManagerSource::on_objects(sd_bus_message* message, void* context, sd_bus_error* /*error*/) {
  auto& source = *static_cast<ModemManagerSource*>(context);
  if (serial_of_call(message) != source.objects_call_) return 0;
  source.objects_call_ = 0;
  source.open_delay_ = kFirstOpenDelay;
  if (const sd_bus_error* error = sd_bus_message_get_error(message); error != nullptr) {
    if (!says_not_running(*error)) {
      source.fail_reading(text_of(*error), sd_bus_message_get_errno(message));
      return 0;
    }
    source.reading_.reach = Reach::not_running;
  } else if (source.take_objects(message) < 0) {
    source.fail_reading("its modems have the wrong form", EBADMSG);
    return 0;
  }
  source.finish_reading();
  return 0;
}

int ModemManagerSource::take_objects(sd_bus_message* message) {
  std::vector<std::string> cards;  // each modem's, empty for none
  int result = each_objects_interface(message, [&](std::string_view interface) {
    if (interface != kModem || reading_.modems.size() == kMostModems) return 0;
    Modem modem;
    std::string card;
    const int taken = take_modem(message, modem, card);
    cards.push_back(modem.has_card ? card : "");
    reading_.modems.push_back(std::move(modem));
    return taken < 0 ? taken : 1;
  });
  for (std::size_t modem = 0; result >= 0 && modem < cards.size(); ++modem) {
    if (!cards[modem].empty()) result = ask_card(cards[modem], modem);
  }
  return result;
}

int ModemManagerSource::ask_card(const std::string& path, std::size_t modem) {
  sd_bus_message* call = nullptr;
  int result = sd_bus_message_new_method_call(bus_, &call, kName, path.c_str(), kProperties, "GetAll");
  const Message owner(call);
  if (result >= 0) result = sd_bus_message_append_basic(call, 's', kSim);
  std::uint64_t serial = 0;
  if (result >= 0) result = this->call(call, on_card, serial);
  if (result >= 0) card_calls_.emplace(serial, modem);
  return result;
}

int ModemManagerSource::on_card(sd_bus_message* message, void* context, sd_bus_error* /*error*/) {
  auto& source = *static_cast<ModemManagerSource*>(context);
  const auto call = source.card_calls_.find(serial_of_call(message));
  if (call == source.card_calls_.end()) return 0;
  Modem& modem = source.reading_.modems[call->second];
  source.card_calls_.erase(call);
  const sd_bus_error* error = sd_bus_message_get_error(message);
  if (error != nullptr) {
    source.fail_reading(text_of(*error), sd_bus_message_get_errno(message));
  } else if (take_card(message, modem) < 0) {
    source.fail_reading("a card has the wrong form", EBADMSG);
  } else {
    source.finish_reading();
  }
  return 0;
}

// A reading of modems stands meanwhile; one that says that nothing runs is wrong by now. A bus that goes fails its
// calls first, and is told of then.
void ModemManagerSource::fail_reading(const std::string& reason, int error) {
  objects_call_ = 0;
  card_calls_.clear();
  is_reading_ = false;
  if (sd_bus_is_open(bus_) <= 0) return;
  is_mute_ = error == ETIMEDOUT;
  if (is_stale_) return;
  say("cannot read ModemManager: " + reason);
  if (last_reach_ != Reach::running) complete_ = Reading{Reach::refused, {}, error};
  read_at_ = Clock::now() + retry_delay_;
  retry_delay_ = std::min(retry_delay_ * 2, kLongestRetry);
}

// A signal that came meanwhile makes the answers worthless, for they could mix two cards; but not when the reading
// before said the same, since then nothing moved between the two.
void ModemManagerSource::finish_reading() {
  if (!card_calls_.empty()) return;
  is_reading_ = false;
  retry_delay_ = std::chrono::seconds(1);
  if (is_stale_ && disturbed_ != reading_) {
    disturbed_ = std::move(reading_);
    return;
  }
  disturbed_.reset();
  if (!said_.empty()) trouble_ = reading_.reach == Reach::running ? "ModemManager answers" : "the bus answers";
  said_.clear();
  last_reach_ = reading_.reach;
  complete_ = std::move(reading_);
}

// Trouble that lasts is said once.
void ModemManagerSource::say(const std::string& trouble) {
  if (trouble != said_) trouble_ = said_ = trouble;
}

}  // namespace quorvel::bridge
