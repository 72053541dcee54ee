// What the simulator tells: notifications, a card that goes in or out, and a record of all that a service tells.
#include <cstdint>

#include "output.h"
#include "sim_calls.h"
#include "sim_record.h"
#include "sim_words.h"
#include "wire/telephony_state.h"

namespace quorvel::tools {
namespace {

PropertyValue text(const std::string& word) {
  PropertyValue value = PropertyValue::string(word);
  if (value) return value;
  throw Failure{kWrongWords, "\"" + word + "\" is not valid UTF-8"};
}

std::uint64_t notify(const std::string& name, std::int64_t count) {
  if (wire::is_telephony_notification(name)) return notify_observers(name, static_cast<std::uint32_t>(count));
  throw Failure{kWrongWords,
                "\"" + name + "\" is no notification. Use one of: " + list_of(wire::kTelephonyNotifications, " or ")};
}

int send_notification(const SimWords& words, bool json) {
  const std::uint64_t observers = notify(words.name, number_of_word(words.count, "--count", 1, UINT32_MAX));
  return print_change({{"name", words.name}}, "observers", PropertyValue::unsigned_integer(observers), json);
}

int insert_sim(const SimWords& words, bool json) {
  set_field(wire::kIccidField.text(), text(words.iccid));
  set_field(wire::kImsiField.text(), text(words.imsi));
  set_field(wire::kSimStatusField.text(), wire::kSimStatusReady);
  const std::uint64_t observers = notify(platform::kSimNewlyInserted.c_str(), 1);
  if (observers > 0) notify(platform::kSimStatusChanged.c_str(), 1);
  return print_change({{"iccid", words.iccid}, {"imsi", words.imsi}}, "observers",
                      PropertyValue::unsigned_integer(observers), json);
}

// The service says that a card is gone with empty texts; a query without a value would only say that it failed.
int eject_sim(const SimWords&, bool json) {
  set_field(wire::kIccidField.text(), text(""));
  set_field(wire::kImsiField.text(), text(""));
  set_field(wire::kSimStatusField.text(), wire::kSimStatusNotInserted);
  const std::uint64_t observers = notify(platform::kSimStatusChanged.c_str(), 1);
  return print_change({}, "observers", PropertyValue::unsigned_integer(observers), json);
}

}  // namespace

void add_event_commands(CLI::App& sim, CommandLine& line, const Words& words) {
  CLI::App& send = add_sim_command(sim, line, words,
                                   {"notify", "Send a notification with the state to everybody who observes",
                                    "  quorvelctl sim notify sim-status-changed\n"
                                    "  quorvelctl sim notify --count 1000 phone-number-changed"},
                                   send_notification);
  add_word(send, "NAME", words->name, "One of " + list_of(wire::kTelephonyNotifications, " and "));
  add_option(send, "--count", words->count, "N", "Send it N times");
  CLI::App& insert = add_sim_command(sim, line, words,
                                     {"insert", "Insert a SIM: set its fields, then send the notifications",
                                      "  quorvelctl sim insert --iccid 8944501234567890123 \\\n"
                                      "    --imsi 234150999999999"},
                                     insert_sim);
  add_option(insert, "--iccid", words->iccid, "S", "The card's identity", Need::kRequired);
  add_option(insert, "--imsi", words->imsi, "S", "The subscriber's identity", Need::kRequired);
  CLI::App& record = add_sim_command(
      sim, line, words,
      {"record", "Write down what a telephony service tells, until interrupted",
       "  quorvelctl sim record modem.jsonl\n"
       "  telvane-sim --replay modem.jsonl --speed 10",
       "Follows the service as the daemon does, the simulator or a real one, and writes a line of JSON for each state "
       "and event with its time: {\"time\": ..., \"event\": NAME, \"state\": {...}}. The simulator plays them again."},
      [](const SimWords& given, bool) { return record_service(given.file); });
  add_word(record, "FILE", words->file, "The file, written anew; - is standard output");
  add_sim_command(sim, line, words, {"eject", "Take the SIM out, and send the notification", "  quorvelctl sim eject"},
                  eject_sim);
}

}  // namespace quorvel::tools
