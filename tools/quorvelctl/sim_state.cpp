// The simulator's state: shown, and changed field by field.
#include <algorithm>
#include <cstdint>

#include "common/human_text.h"
#include "common/json.h"
#include "output.h"
#include "sim_calls.h"
#include "sim_words.h"
#include "wire/telephony_state.h"

namespace quorvel::tools {
namespace {

const std::string& field(const SimWords& words) {
  for (const std::string_view name : wire::kStateFields) {
    if (words.field == name) return words.field;
  }
  throw Failure{kWrongWords, "\"" + words.field + "\" is no FIELD. Use one of: " + list_of(wire::kStateFields, " or ")};
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
  const PropertyValue value = value_of_word(words.json, "JSON");
  set_field(name, value);
  if (value.kind() == PropertyKind::integer && name != wire::kPostponementField.text()) {
    note("a number is set, which the daemon ignores where it expects a text. For the text: quorvelctl sim set " + name +
         " '\"" + words.json + "\"'");
  }
  return print_change({{"field", name}}, "value", value, json);
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

void add_field(CLI::App& command, const Words& words) {
  add_word(command, "FIELD", words->field, "One of " + list_of(wire::kStateFields, " and "));
}

}  // namespace

void add_state_commands(CLI::App& sim, CommandLine& line, const Words& words) {
  add_sim_command(sim, line, words,
                  {"show", "Print the telephony service's present state", "  quorvelctl sim show --json"}, show_state);
  CLI::App& set = add_sim_command(sim, line, words,
                                  {"set", "Give a query a value; nobody is notified",
                                   "  quorvelctl sim set gid1 '\"A1\"'\n"
                                   "  quorvelctl sim set postponement \\\n"
                                   "    '{\"Status\": \"Ready\", \"Carrier\": \"Sample\"}'"},
                                  set_value);
  add_field(set, words);
  add_word(set, "JSON", words->json, "The value as JSON; a text needs its double quotes: '\"text\"'");
  add_field(add_sim_command(sim, line, words, {"clear", "Take a query's value away", "  quorvelctl sim clear gid1"},
                            clear_value),
            words);
  CLI::App& fail = add_sim_command(sim, line, words,
                                   {"fail", "Make a query answer an error pair, beside its value",
                                    "  quorvelctl sim fail imsi 1 -5\n"
                                    "  quorvelctl sim fail connection 1 1"},
                                   fail_query);
  add_field(fail, words);
  add_word(fail, "DOMAIN", words->domain, "The error's domain, a 32-bit integer");
  add_word(fail, "CODE", words->code, "The error's code, a 32-bit integer; 0 is no failure");
  add_field(
      add_sim_command(sim, line, words, {"succeed", "Take a query's error pair away", "  quorvelctl sim succeed imsi"},
                      succeed_query),
      words);
}

}  // namespace quorvel::tools
