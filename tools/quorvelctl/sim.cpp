#include <array>
#include <charconv>
#include <cstdint>

#include "client_failure.h"
#include "commands.h"
#include "common/human_text.h"
#include "common/telephony_names.h"
#include "common/words.h"
#include "output.h"
#include "wire/telephony_state.h"

namespace quorvel::tools {
namespace {

constexpr const char* kService = "telvane";

struct SimWords {
  std::string field, json, domain, code, name, iccid, imsi;
  std::string count = "1";
};

PropertyValue ask(std::string_view command, const PropertyValue& argument) {
  client::Options options;
  options.service = kService;
  // A notification is answered once the daemon has taken what was sent before it.
  options.timeout = std::chrono::minutes(10);
  const client::Reply reply = client::Client(options).call(command, argument);
  if (!reply.error) return reply.value;
  if (reply.error->code == client::ErrorCode::service_failure) {
    throw Failure{kWrongWords, "telvane-sim refuses: " + reply.error->description};
  }
  throw unreachable(*reply.error, "the simulator", "telvane-sim");
}

void tell(std::string_view command, const PropertyValue& argument) { static_cast<void>(ask(command, argument)); }

PropertyValue entries(std::initializer_list<std::pair<std::string_view, PropertyValue>> list) {
  PropertyValue dictionary = PropertyValue::dictionary(list.size());
  for (const auto& [key, value] : list) {
    if (value && !dictionary.set(key, value)) throw Failure{kUnreachable, "memory does not suffice"};
  }
  return dictionary;
}

PropertyValue text(const std::string& word) {
  PropertyValue value = PropertyValue::string(word);
  if (value) return value;
  throw Failure{kWrongWords, "\"" + word + "\" is not valid UTF-8"};
}

PropertyValue number(const std::string& word, const std::string& what, std::int64_t minimum, std::int64_t maximum) {
  std::int64_t result = 0;
  const auto [end, failure] = std::from_chars(word.data(), word.data() + word.size(), result);
  if (failure == std::errc{} && end == word.data() + word.size() && result >= minimum && result <= maximum) {
    return PropertyValue::integer(result);
  }
  throw Failure{kWrongWords, what + " is \"" + word + "\", but takes an integer from " + std::to_string(minimum) +
                                 " to " + std::to_string(maximum)};
}

PropertyValue field(const SimWords& words) {
  std::string all;
  for (const std::string_view name : wire::kStateFields) {
    if (words.field == name) return text(words.field);
    all.append(all.empty() ? "" : ", ").append(name);
  }
  throw Failure{kWrongWords, "\"" + words.field + "\" is no FIELD. Use one of: " + all};
}

void set_field(std::string_view name, const PropertyValue& value) {
  tell(wire::kSetCommand,
       entries({{wire::kCommandFieldKey.text(), PropertyValue::string(name)}, {wire::kStateValueKey.text(), value}}));
}

void notify(const std::string& name, const std::string& count) {
  if (!is_telephony_notification(name)) {
    throw Failure{kWrongWords, "\"" + name +
                                   "\" is no notification. Use one of: sim-newly-inserted, sim-status-changed, "
                                   "phone-number-changed, postponement-status-changed"};
  }
  tell(wire::kNotifyCommand, entries({{wire::kCommandNameKey.text(), text(name)},
                                      {wire::kCommandCountKey.text(), number(count, "--count", 1, UINT32_MAX)}}));
}

int show_state(bool json) {
  const PropertyValue state = ask(wire::kShowCommand, {});
  if (json) return print_value(state, true);
  const Palette& colours = palette();
  std::string lines;
  for (const std::string_view name : wire::kStateFields) {
    const PropertyValue& entry = state.get(name);
    const std::int64_t code = entry.get(wire::kStateCodeKey.text()).to_int64().value_or(0);
    const std::int64_t domain = entry.get(wire::kStateDomainKey.text()).to_int64().value_or(0);
    lines.append(colours.key)
        .append(name)
        .append(colours.reset)
        .append(20 - std::min<std::size_t>(name.size(), 19), ' ');
    const PropertyValue& value = entry.get(wire::kStateValueKey.text());
    if (name != wire::kConnectionField.text()) lines += value ? one_line(value) : "(nothing)";
    if (code != 0)
      lines.append(name == wire::kConnectionField.text() ? "" : "  ") +=
          "fails with " + std::to_string(domain) + '.' + std::to_string(code);
    if (name == wire::kConnectionField.text() && code == 0) lines += "succeeds";
    lines += '\n';
  }
  write_output(lines);
  return kDone;
}

int insert_sim(const SimWords& words) {
  set_field(wire::kIccidField.text(), text(words.iccid));
  set_field(wire::kImsiField.text(), text(words.imsi));
  set_field(wire::kSimStatusField.text(), wire::kSimStatusReady);
  notify(platform::kSimNewlyInserted.c_str(), "1");
  notify(platform::kSimStatusChanged.c_str(), "1");
  return kDone;
}

// The service says that a card is gone with empty texts; a query without a value would only say that it failed.
int eject_sim() {
  set_field(wire::kIccidField.text(), text(""));
  set_field(wire::kImsiField.text(), text(""));
  set_field(wire::kSimStatusField.text(), wire::kSimStatusNotInserted);
  notify(platform::kSimStatusChanged.c_str(), "1");
  return kDone;
}

using Words = std::shared_ptr<SimWords>;

CLI::App* add(CLI::App& sim, CommandLine& line, const Words& words, const char* name, const char* summary,
              const std::string& example, int (*run)(const SimWords&, bool json)) {
  CLI::App* command = add_command(sim, {name, summary, example});
  command->callback([&line, words, run] { line.run = [&line, words, run] { return run(*words, line.json); }; });
  return command;
}

void add_field(CLI::App& command, const Words& words) {
  add_word(command, "FIELD", words->field,
           "sim-status, iccid, imsi, firmware-version, bootloader-version, gid1, gid2, postponement or connection")
      ->required();
}

void add_state_commands(CLI::App& sim, CommandLine& line, const Words& words) {
  add(sim, line, words, "show", "Print the simulator's present state", "  quorvelctl sim show --json",
      [](const SimWords&, bool json) { return show_state(json); });
  CLI::App* set = add(sim, line, words, "set", "Give a query a value; nobody is notified",
                      "  quorvelctl sim set gid1 '\"A1\"'\n"
                      "  quorvelctl sim set postponement '{\"Status\": \"Ready\", \"Carrier\": \"Sample\"}'",
                      [](const SimWords& given, bool) {
                        const PropertyValue name = field(given);
                        set_field(name.text(), value_of_word(given.json, "JSON"));
                        return static_cast<int>(kDone);
                      });
  add_field(*set, words);
  add_word(*set, "JSON", words->json, "The value as JSON; a text needs its double quotes: '\"text\"'")->required();
  CLI::App* clear = add(sim, line, words, "clear", "Take a query's value away", "  quorvelctl sim clear gid1",
                        [](const SimWords& given, bool) {
                          set_field(field(given).text(), {});
                          return static_cast<int>(kDone);
                        });
  add_field(*clear, words);
  CLI::App* fail =
      add(sim, line, words, "fail", "Make a query answer an error pair, beside its value",
          "  quorvelctl sim fail imsi 1 -5\n"
          "  quorvelctl sim fail connection 1 1",
          [](const SimWords& given, bool) {
            tell(wire::kFailCommand,
                 entries({{wire::kCommandFieldKey.text(), field(given)},
                          {wire::kStateDomainKey.text(), number(given.domain, "DOMAIN", INT32_MIN, INT32_MAX)},
                          {wire::kStateCodeKey.text(), number(given.code, "CODE", INT32_MIN, INT32_MAX)}}));
            return static_cast<int>(kDone);
          });
  add_field(*fail, words);
  add_word(*fail, "DOMAIN", words->domain, "The error's domain, a 32-bit integer")->required();
  add_word(*fail, "CODE", words->code, "The error's code, a 32-bit integer; 0 is no failure")->required();
  CLI::App* succeed = add(sim, line, words, "succeed", "Take a query's error pair away",
                          "  quorvelctl sim succeed imsi", [](const SimWords& given, bool) {
                            tell(wire::kSucceedCommand, entries({{wire::kCommandFieldKey.text(), field(given)}}));
                            return static_cast<int>(kDone);
                          });
  add_field(*succeed, words);
}

void add_event_commands(CLI::App& sim, CommandLine& line, const Words& words) {
  CLI::App* send = add(sim, line, words, "notify", "Send a notification with the state to whoever observes",
                       "  quorvelctl sim notify sim-status-changed\n"
                       "  quorvelctl sim notify --count 1000 phone-number-changed",
                       [](const SimWords& given, bool) {
                         notify(given.name, given.count);
                         return static_cast<int>(kDone);
                       });
  add_word(*send, "NAME", words->name,
           "sim-newly-inserted, sim-status-changed, phone-number-changed or postponement-status-changed")
      ->required();
  add_word(*send, "--count", words->count, "Send it so many times")->option_text("N");
  CLI::App* insert = add(sim, line, words, "insert", "Insert a SIM: set its fields, then send the notifications",
                         "  quorvelctl sim insert --iccid 8944501234567890123 --imsi 234150999999999",
                         [](const SimWords& given, bool) { return insert_sim(given); });
  add_word(*insert, "--iccid", words->iccid, "The card's identity")->required()->option_text("S");
  add_word(*insert, "--imsi", words->imsi, "The subscriber's identity")->required()->option_text("S");
  add(sim, line, words, "eject", "Take the SIM out", "  quorvelctl sim eject",
      [](const SimWords&, bool) { return eject_sim(); });
}

}  // namespace

void add_sim(CLI::App& app, CommandLine& line) {
  CLI::App* sim = add_command(app, {"sim", "Show and change what telvane-sim, the simulated telephony service, answers",
                                    "  quorvelctl sim insert --iccid 8944501234567890123 --imsi 234150999999999\n"
                                    "  quorvelctl sim show\n"
                                    "  quorvelctl sim eject"});
  sim->require_subcommand(1);
  const auto words = std::make_shared<SimWords>();
  add_state_commands(*sim, line, words);
  add_event_commands(*sim, line, words);
}

}  // namespace quorvel::tools
