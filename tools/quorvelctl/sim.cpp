#include <array>
#include <cstdint>

#include "commands.h"
#include "common/human_text.h"
#include "common/json.h"
#include "common/words.h"
#include "output.h"
#include "sim_calls.h"
#include "sim_record.h"
#include "wire/telephony_state.h"

namespace quorvel::tools {
namespace {

struct SimWords {
  std::string field, json, domain, code, name, iccid, imsi, file;
  std::string count = "1";
};

PropertyValue text(const std::string& word) {
  PropertyValue value = PropertyValue::string(word);
  if (value) return value;
  throw Failure{kWrongWords, "\"" + word + "\" is not valid UTF-8"};
}

template <typename Names>
std::string list_of(const Names& names, const std::string& last) {
  std::string list;
  for (std::size_t i = 0; i < std::size(names); ++i) {
    list += (i == 0 ? "" : i + 1 == std::size(names) ? last : ", ") + std::string(names[i]);
  }
  return list;
}

const std::string& field(const SimWords& words) {
  for (const std::string_view name : wire::kStateFields) {
    if (words.field == name) return words.field;
  }
  throw Failure{kWrongWords, "\"" + words.field + "\" is no FIELD. Use one of: " + list_of(wire::kStateFields, " or ")};
}

std::uint64_t notify(const std::string& name, std::int64_t count) {
  if (wire::is_telephony_notification(name)) return notify_observers(name, static_cast<std::uint32_t>(count));
  throw Failure{kWrongWords,
                "\"" + name + "\" is no notification. Use one of: " + list_of(wire::kTelephonyNotifications, " or ")};
}

std::int32_t error_number(const std::string& word, const std::string& name) {
  return static_cast<std::int32_t>(number_of_word(word, name, INT32_MIN, INT32_MAX));
}

// A line for each field: its value as JSON, so that a number is no text, and its error pair.
int show_state(const SimWords&, bool json) {
  const PropertyValue state = simulator_state();
  if (json) return print_value(state, true);
  const Palette& colours = palette();
  std::size_t widest = 0;
  for (const std::string_view name : wire::kStateFields) widest = std::max(widest, name.size());
  std::string lines;
  for (const std::string_view name : wire::kStateFields) {
    const PropertyValue& entry = state.get(name);
    const PropertyValue& value = entry.get(wire::kStateValueKey.text());
    const std::int64_t code = entry.get(wire::kStateCodeKey.text()).to_int64().value_or(0);
    const std::int64_t domain = entry.get(wire::kStateDomainKey.text()).to_int64().value_or(0);
    lines.append(colours.key).append(name).append(colours.reset).append(widest + 2 - name.size(), ' ');
    const bool connection = name == wire::kConnectionField.text();
    const std::string failure = "fails with " + std::to_string(domain) + '.' + std::to_string(code);
    if (connection) {
      lines += code == 0 ? "succeeds" : failure;
    } else {
      lines += value ? to_json(value, -1) : std::string(colours.quiet) + "(nothing)" + std::string(colours.reset);
      if (code != 0) lines += "  " + failure;
    }
    lines += '\n';
  }
  write_output(lines);
  return kDone;
}

// A number is taken, since a modem may be that wrong, but seldom meant.
int set_value(const SimWords& words, bool json) {
  const std::string& name = field(words);
  const ParsedJson parsed = parse_json(words.json);
  if (parsed.error) throw Failure{kWrongWords, "JSON: " + *parsed.error + ". In a shell: '\"text\"'"};
  set_field(name, parsed.value);
  if (parsed.value.kind() == PropertyKind::integer && name != wire::kPostponementField.text()) {
    note("a number is set, which the daemon ignores where it expects a text. For the text: quorvelctl sim set " + name +
         " '\"" + words.json + "\"'");
  }
  return print_change({{"field", name}}, "value", parsed.value, json);
}

int clear_value(const SimWords& words, bool json) {
  set_field(field(words), {});
  return print_change({{"field", words.field}}, {}, {}, json);
}

int fail_query(const SimWords& words, bool json) {
  const std::string& name = field(words);
  const std::int32_t domain = error_number(words.domain, "DOMAIN");
  const std::int32_t code = error_number(words.code, "CODE");
  set_error(name, domain, code);
  PropertyValue pair = PropertyValue::dictionary(2);
  put(pair, wire::kStateDomainKey.text(), PropertyValue::integer(domain));
  put(pair, wire::kStateCodeKey.text(), PropertyValue::integer(code));
  return print_change({{"field", name}}, "error", pair, json);
}

int succeed_query(const SimWords& words, bool json) {
  clear_error(field(words));
  return print_change({{"field", words.field}}, {}, {}, json);
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

using Words = std::shared_ptr<SimWords>;
using Run = int (*)(const SimWords&, bool json);

CLI::App* add(CLI::App& sim, CommandLine& line, const Words& words, const CommandWords& own, Run run) {
  CLI::App* command = add_command(sim, own);
  command->callback([&line, words, run] { line.run = [&line, words, run] { return run(*words, line.json); }; });
  return command;
}

void add_field(CLI::App& command, const Words& words) {
  add_word(command, "FIELD", words->field, "One of " + list_of(wire::kStateFields, " and "))->required();
}

void add_state_commands(CLI::App& sim, CommandLine& line, const Words& words) {
  add(sim, line, words, {"show", "Print the telephony service's present state", "  quorvelctl sim show --json"},
      show_state);
  CLI::App* set = add(sim, line, words,
                      {"set", "Give a query a value; nobody is notified",
                       "  quorvelctl sim set gid1 '\"A1\"'\n"
                       "  quorvelctl sim set postponement \\\n"
                       "    '{\"Status\": \"Ready\", \"Carrier\": \"Sample\"}'"},
                      set_value);
  add_field(*set, words);
  add_word(*set, "JSON", words->json, "The value as JSON; a text needs its double quotes: '\"text\"'")->required();
  add_field(*add(sim, line, words, {"clear", "Take a query's value away", "  quorvelctl sim clear gid1"}, clear_value),
            words);
  CLI::App* fail = add(sim, line, words,
                       {"fail", "Make a query answer an error pair, beside its value",
                        "  quorvelctl sim fail imsi 1 -5\n"
                        "  quorvelctl sim fail connection 1 1"},
                       fail_query);
  add_field(*fail, words);
  add_word(*fail, "DOMAIN", words->domain, "The error's domain, a 32-bit integer")->required();
  add_word(*fail, "CODE", words->code, "The error's code, a 32-bit integer; 0 is no failure")->required();
  add_field(*add(sim, line, words, {"succeed", "Take a query's error pair away", "  quorvelctl sim succeed imsi"},
                 succeed_query),
            words);
}

void add_event_commands(CLI::App& sim, CommandLine& line, const Words& words) {
  CLI::App* send = add(sim, line, words,
                       {"notify", "Send a notification with the state to everybody who observes",
                        "  quorvelctl sim notify sim-status-changed\n"
                        "  quorvelctl sim notify --count 1000 phone-number-changed"},
                       send_notification);
  add_word(*send, "NAME", words->name, "One of " + list_of(wire::kTelephonyNotifications, " and "))->required();
  add_word(*send, "--count", words->count, "Send it N times")->option_text("N");
  CLI::App* insert = add(sim, line, words,
                         {"insert", "Insert a SIM: set its fields, then send the notifications",
                          "  quorvelctl sim insert --iccid 8944501234567890123 \\\n"
                          "    --imsi 234150999999999"},
                         insert_sim);
  add_word(*insert, "--iccid", words->iccid, "The card's identity")->required()->option_text("S");
  add_word(*insert, "--imsi", words->imsi, "The subscriber's identity")->required()->option_text("S");
  CLI::App* record = add(
      sim, line, words,
      {"record", "Write down what a telephony service tells, until interrupted",
       "  quorvelctl sim record modem.jsonl\n"
       "  telvane-sim --replay modem.jsonl --speed 10",
       "Follows the service as the daemon does, the simulator or a real one, and writes a line of JSON for each state "
       "and event with its time: {\"time\": ..., \"event\": NAME, \"state\": {...}}. The simulator plays them again."},
      [](const SimWords& given, bool) { return record_service(given.file); });
  add_word(*record, "FILE", words->file, "The file, written anew; - is standard output")->required();
  add(sim, line, words, {"eject", "Take the SIM out, and send the notification", "  quorvelctl sim eject"}, eject_sim);
}

}  // namespace

void add_sim(CLI::App& app, CommandLine& line) {
  CLI::App* sim = add_command(app, {"sim", "Command the simulated telephony service, telvane-sim",
                                    "  quorvelctl sim insert --iccid 8944501234567890123 \\\n"
                                    "    --imsi 234150999999999\n"
                                    "  quorvelctl sim show\n"
                                    "  quorvelctl sim eject"});
  sim->require_subcommand(1);
  const auto words = std::make_shared<SimWords>();
  add_state_commands(*sim, line, words);
  add_event_commands(*sim, line, words);
}

}  // namespace quorvel::tools
