#include <sys/stat.h>

#include <cerrno>
#include <memory>
#include <optional>
#include <utility>

#include "commands.h"
#include "common/human_text.h"
#include "files.h"
#include "live_answer.h"
#include "output.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"
#include "saved_ark.h"

namespace quorvel::tools {
namespace {

constexpr const char* kSavesOnce = "The daemon saves once, at its start: what it holds now may differ";

struct ArkWords {
  std::string domain;
  bool has_domain = false;
  bool all = false;
  bool domains = false;
  bool raw = false;
  std::string key;
};

PropertyValue read_ark() {
  if (std::optional<PropertyValue> ark = read_saved_ark()) return *ark;
  struct stat status {};
  if (platform::file_status(paths::kStateDirectory, &status) != 0) fail_on("look into", paths::kStateDirectory);
  note(std::string("nothing is saved in ") + paths::kDataFile + ". " + kSavesOnce);
  return PropertyValue::dictionary();
}

std::string in_domain(const ArkWords& words) {
  return words.has_domain ? " in the domain \"" + words.domain + '"' : " without a domain";
}

std::string list_command(const ArkWords& words) {
  return std::string("quorvelctl ark list") + (words.has_domain ? " --domain " + shell_word(words.domain) : "");
}

int list_domain(const ArkWords& words, const PropertyValue& ark, bool json) {
  const std::string prefix = words.domain + '-';
  PropertyValue view = PropertyValue::dictionary();
  for (const auto [key, value] : ark.entries()) {
    if (key.text().starts_with(prefix)) put(view, key.text().substr(prefix.size()), value);
  }
  if (view.size() > 0) return print_value(view, json);
  if (ark.size() > 0)
    note("there are no saved entries" + in_domain(words) + ". See all with: quorvelctl ark list --all");
  if (json) write_output("{}\n");
  return kDone;
}

// A dictionary of the domains, each a dictionary of its entries.
PropertyValue by_domain(const PropertyValue& ark) {
  PropertyValue view = PropertyValue::dictionary();
  PropertyValue domain;
  std::string name;
  const std::vector<SavedEntry> entries = saved_entries(ark);
  for (std::size_t i = 0; i < entries.size(); ++i) {
    if (!domain) domain = PropertyValue::dictionary();
    put(domain, entries[i].key, entries[i].value);
    if (i + 1 < entries.size() && entries[i + 1].domain == entries[i].domain) continue;
    put(view, entries[i].domain, std::exchange(domain, {}));
  }
  return view;
}

int list_all(const PropertyValue& ark, bool json) {
  const PropertyValue view = by_domain(ark);
  if (json || view.size() > 0) return print_value(view, json);
  return kDone;
}

int list_domains(const PropertyValue& ark, bool json) {
  PropertyValue names = PropertyValue::array();
  std::string lines;
  for (const SavedEntry& entry : saved_entries(ark)) {
    const PropertyValue name = PropertyValue::string(entry.domain);
    if (names.size() > 0 && names.at(names.size() - 1) == name) continue;
    if (!names.append(name)) fail_for_memory();
    lines += one_line(name) + '\n';
  }
  if (json) return print_value(names, true);
  write_output(lines);
  return kDone;
}

int list_entries(const ArkWords& words, bool json) {
  if ((words.all && words.domains) || (words.has_domain && (words.all || words.domains))) {
    throw Failure{kWrongWords, "--all, --domains and --domain do not go together; use one of them"};
  }
  const PropertyValue ark = read_ark();
  if (words.all) return list_all(ark, json);
  return words.domains ? list_domains(ark, json) : list_domain(words, ark, json);
}

int get_key(const ArkWords& words, const Form& form) {
  const LiveAnswer live = live_answer(words.domain, words.has_domain, words.key);
  if (live.row != nullptr) {
    if (live.value) return print_value(live.value, form);
    return print_no_value(
        "\"" + words.key + "\" is answered live, and this device does not know it. An administrator can give it in " +
            paths::kDeviceInformation,
        form.json);
  }
  const std::optional<PropertyValue> ark = read_saved_ark();
  const PropertyValue value = ark ? ark->get(words.domain + '-' + words.key) : PropertyValue();
  if (value) return print_value(value, form);
  return print_no_value("\"" + words.key + "\" is not saved" + in_domain(words) +
                            ". See what is with: " + list_command(words) + ". " + kSavesOnce,
                        form.json);
}

void add_domain(CLI::App& command, ArkWords& words) {
  add_option(command, "--domain", words.domain, "DOMAIN", "The domain; without it, entries that have none");
}

}  // namespace

void add_ark(CLI::App& app, CommandLine& line) {
  CLI::App& ark = add_group(app, {"ark", "Read the saved data ark, without the daemon",
                                  "  quorvelctl ark list --all\n"
                                  "  quorvelctl ark get ProductVersion\n"
                                  "  quorvelctl ark get --domain com.Orvane.mobile.battery \\\n"
                                  "    BatteryIsCharging"});
  auto words = std::make_shared<ArkWords>();

  CLI::App& list = add_command(ark, {"list", "Print a domain's saved entries",
                                     "  quorvelctl ark list --domain com.example.settings --json\n"
                                     "  quorvelctl ark list --domains",
                                     "The daemon saves its entries once, at its start, and removes the file when there "
                                     "is nothing to save: what a running daemon holds may differ. Keys that are "
                                     "answered live are never saved; see quorvelctl facts."});
  add_domain(list, *words);
  add_switch(list, "--all", words->all, "Every entry, by domain");
  add_switch(list, "--domains", words->domains, "The names of the domains that have entries");
  when_chosen(list, [&line, words, &list] {
    words->has_domain = is_given(list, "--domain");
    line.run = [&line, words] { return list_entries(*words, line.json); };
  });

  CLI::App& get = add_command(ark, {"get", "Print one key, live from the device where the daemon would ask it",
                                    "  quorvelctl ark get PreviousSIMStatus\n"
                                    "  quorvelctl ark get --raw SerialNumber"});
  add_domain(get, *words);
  add_raw(get, words->raw);
  add_word(get, "KEY", words->key, "The key");
  when_chosen(get, [&line, words, &get] {
    words->has_domain = is_given(get, "--domain");
    line.run = [&line, words] { return get_key(*words, {line.json, words->raw}); };
  });
}

}  // namespace quorvel::tools
