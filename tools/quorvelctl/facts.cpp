#include <unistd.h>

#include <algorithm>
#include <chrono>
#include <memory>
#include <thread>
#include <utility>

#include "commands.h"
#include "common/human_text.h"
#include "common/json.h"
#include "daemon_process.h"
#include "facts_text.h"
#include "live_answer.h"
#include "output.h"
#include "telephony_look.h"

namespace quorvel::tools {
namespace {

struct FactWords {
  bool all = false;
  std::vector<std::string> keys;
  std::string seconds;
};

using Rows = std::vector<const larry_info*>;

// By domain, those without one first, and in the table's order within a domain.
Rows chosen_rows(const std::vector<std::string>& keys) {
  Rows rows;
  for (const larry_info& row : kLiveAnswers) {
    if (keys.empty() || std::find(keys.begin(), keys.end(), row.key) != keys.end()) rows.push_back(&row);
  }
  for (const std::string& key : keys) {
    if (std::any_of(rows.begin(), rows.end(), [&key](const larry_info* row) { return row->key == key; })) continue;
    throw Failure{kWrongWords,
                  "\"" + key + "\" is no key that is answered live. See them with: quorvelctl facts --all"};
  }
  std::stable_sort(rows.begin(), rows.end(),
                   [](const larry_info* a, const larry_info* b) { return a->domain < b->domain; });
  return rows;
}

std::vector<LiveAnswer> ask(const Rows& rows) {
  look_at_telephony();
  std::vector<LiveAnswer> facts;
  for (const larry_info* row : rows) facts.push_back(live_answer(*row));
  return facts;
}

int print_facts(std::vector<LiveAnswer> facts, bool all, bool json) {
  const auto unanswered = [](const LiveAnswer& fact) { return !fact.value; };
  const bool none = std::all_of(facts.begin(), facts.end(), unanswered);
  if (!all) std::erase_if(facts, unanswered);
  if (json) {
    PropertyValue array = PropertyValue::array();
    for (const LiveAnswer& fact : facts) {
      if (!array.append(fact_value(fact))) fail_for_memory();
    }
    print_value(array, true);
  } else {
    write_output(facts_text(facts, terminal_width().value_or(80)));
  }
  return none ? kNoValue : kDone;
}

void print_change_of(const LiveAnswer& fact, bool json) {
  const double time = seconds_now();
  if (json) {
    PropertyValue line = fact_value(fact);
    put(line, "time", PropertyValue::date(time));
    return write_output(to_json(line, -1) + '\n');
  }
  const Palette& colours = palette();
  std::string line(colours.quiet);
  line.append(one_line(PropertyValue::date(time))).append(colours.reset).append("  ").append(colours.key);
  line.append(fact.row->key).append(colours.reset).append("  ");
  write_output(line + value_text(fact) + '\n');
}

// Asks again and again, and prints each answer that is another than before.
int watch(const Rows& rows, std::vector<LiveAnswer> facts, std::chrono::seconds interval, bool json) {
  for (;;) {
    std::this_thread::sleep_for(interval);
    std::vector<LiveAnswer> now = ask(rows);
    for (std::size_t i = 0; i < now.size(); ++i) {
      if (now[i].value != facts[i].value) print_change_of(now[i], json);
    }
    facts = std::move(now);
  }
}

int run_facts(const FactWords& words, bool json) {
  const Rows rows = chosen_rows(words.keys);
  const bool watched = !words.seconds.empty();
  const auto interval = std::chrono::seconds(watched ? number_of_word(words.seconds, "--watch", 1, 86'400) : 0);
  if (watched) end_when_interrupted();
  const std::vector<LiveAnswer> facts = ask(rows);
  note("asked as " + user_name(::geteuid()) + ", outside the daemon's sandbox");
  if (watched && json) {
    for (const LiveAnswer& fact : facts) {
      if (fact.value || words.all) print_change_of(fact, true);
    }
    return watch(rows, facts, interval, true);
  }
  const int status = print_facts(facts, words.all || !words.keys.empty(), json);
  return watched ? watch(rows, facts, interval, json) : status;
}

}  // namespace

void add_facts(CLI::App& app, CommandLine& line) {
  CLI::App& command = add_command(
      app, {"facts", "Print what the device answers live, and from where",
            "  quorvelctl facts\n"
            "  quorvelctl facts SerialNumber HardwareModel\n"
            "  quorvelctl facts --watch 5 BatteryCurrentCapacity\n"
            "  quorvelctl facts --json | jq -r '.[].key'",
            "Asks the device in this process, as the caller and outside the daemon's sandbox: the daemon may "
            "see less, and root sees more. What the telephony service tells counts as well, and packaging's "
            "answers in /etc/quorvel/device_information.plist win over everything.\n\n"
            "Exit status: 1 when nothing that was asked for has an answer."});
  auto words = std::make_shared<FactWords>();
  add_switch(command, "--all", words->all, "Also the keys without an answer");
  add_option(command, "--watch", words->seconds, "SECONDS", "Ask again every so many seconds and print what changes");
  add_words(command, "KEY", words->keys, "These keys only");
  when_chosen(command, [&line, words] { line.run = [&line, words] { return run_facts(*words, line.json); }; });
}

}  // namespace quorvel::tools
