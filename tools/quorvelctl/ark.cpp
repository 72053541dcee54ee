#include <sys/stat.h>

#include <cerrno>

#include "commands.h"
#include "common/words.h"
#include "files.h"
#include "live_answer.h"
#include "output.h"
#include "platform/file_system.h"

namespace quorvel::tools {
namespace {

constexpr const char* kStateDirectory = "/private/var/mobile/Library/qvd";
constexpr const char* kArkFile = "/private/var/mobile/Library/qvd/data_ark.plist";

struct ArkWords {
  std::string domain;
  bool has_domain = false;
  std::string key;
};

// The saved data ark; the daemon removes the file when it has nothing to save.
PropertyValue read_ark() {
  std::optional<PropertyValue> ark = read_device_plist(kArkFile);
  if (!ark) {
    struct stat status {};
    if (platform::file_status(kStateDirectory, &status) != 0) fail_on("look into", kStateDirectory);
    note(std::string("nothing is saved in ") + kArkFile);
    return PropertyValue::dictionary();
  }
  if (ark->is_dictionary()) return *ark;
  throw Failure{kUnreachable, std::string(kArkFile) + " is not a dictionary, so the daemon will set it aside"};
}

std::string in_domain(const ArkWords& words) {
  return words.has_domain ? " in the domain \"" + words.domain + '"' : " without a domain";
}

int list_domain(const ArkWords& words, bool json) {
  const std::string prefix = words.domain + '-';
  PropertyValue view = PropertyValue::dictionary();
  const PropertyValue ark = read_ark();
  for (const auto [key, value] : ark.entries()) {
    if (!key.text().starts_with(prefix)) continue;
    if (!view.set(key.text().substr(prefix.size()), value)) throw Failure{kUnreachable, "memory does not suffice"};
  }
  if (view.size() == 0) note("there are no saved entries" + in_domain(words));
  return print_value(view, json);
}

int get_key(const ArkWords& words, bool json) {
  const LiveAnswer live = live_answer(words.domain, words.has_domain, words.key);
  if (live.is_live) {
    if (live.value) return print_value(live.value, json);
    return print_no_value("\"" + words.key +
                              "\" is answered live, and the device-information service has no answer. "
                              "Give it one in /etc/quorvel/device_information.plist",
                          json);
  }
  const PropertyValue ark = read_ark();
  const PropertyValue& value = ark.get(words.domain + '-' + words.key);
  if (value) return print_value(value, json);
  return print_no_value(
      "\"" + words.key + "\" is not saved" + in_domain(words) + ". See what is with: quorvelctl ark list", json);
}

void add_domain(CLI::App& command, ArkWords& words) {
  add_word(command, "--domain", words.domain, "The domain; without it, entries that have none")->option_text("DOMAIN");
}

}  // namespace

void add_ark(CLI::App& app, CommandLine& line) {
  CLI::App* ark = add_command(app, "ark", "Read the saved data ark, without the daemon",
                              "  quorvelctl ark list\n"
                              "  quorvelctl ark get ProductVersion\n"
                              "  quorvelctl ark get --domain com.Orvane.mobile.battery BatteryIsCharging");
  ark->require_subcommand(1);
  auto words = std::make_shared<ArkWords>();

  CLI::App* list = add_command(*ark, "list", "Print a domain's saved entries",
                               "  quorvelctl ark list --domain com.example.settings --json");
  add_domain(*list, *words);
  list->callback([&line, words, list] {
    words->has_domain = list->count("--domain") > 0;
    line.run = [&line, words] { return list_domain(*words, line.json); };
  });

  CLI::App* get = add_command(*ark, "get", "Print one key, live from the device where the daemon would ask it too",
                              "  quorvelctl ark get PreviousSIMStatus");
  add_domain(*get, *words);
  add_word(*get, "KEY", words->key, "The key")->required();
  get->callback([&line, words, get] {
    words->has_domain = get->count("--domain") > 0;
    line.run = [&line, words] { return get_key(*words, line.json); };
  });
}

}  // namespace quorvel::tools
