#include <dirent.h>
#include <fcntl.h>

#include <algorithm>
#include <cstdlib>
#include <memory>

#include "commands.h"
#include "files.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"
#include "saved_ark.h"
#include "store/live_answer_table.h"
#include "wire/telephony_state.h"

namespace quorvel::tools {
namespace {

constexpr std::string_view kExtension = ".plist";
constexpr const char* kOwnDomain = "com.Orvane.quorveld";
constexpr const char* kSaved = "saved";
constexpr const char* kLive = "answered live";

const std::string* find(const UnfinishedCall& call, const char* name) {
  const auto found = call.given.find(name);
  return found == call.given.end() ? nullptr : &found->second;
}

void add_once(std::vector<Candidate>& list, std::string_view text, const char* description) {
  const auto is_it = [text](const Candidate& candidate) { return candidate.text == text; };
  if (std::none_of(list.begin(), list.end(), is_it)) list.push_back({std::string(text), description});
}

std::vector<Candidate> preference_domains() {
  std::vector<Candidate> domains{{kOwnDomain, "the daemon's own"}};
  const int descriptor = platform::open_file(paths::kPreferencesDirectory, O_RDONLY | O_DIRECTORY, 0);
  const std::unique_ptr<DIR, int (*)(DIR*)> directory(descriptor < 0 ? nullptr : ::fdopendir(descriptor), ::closedir);
  while (const dirent* entry = directory ? ::readdir(directory.get()) : nullptr) {
    const std::string_view name = entry->d_name;
    if (name.starts_with('.') || !name.ends_with(kExtension)) continue;
    add_once(domains, name.substr(0, name.size() - kExtension.size()), "");
  }
  return domains;
}

std::vector<Candidate> preference_keys(const UnfinishedCall& call) {
  std::vector<Candidate> keys;
  const std::string* domain = find(call, "DOMAIN");
  if (domain == nullptr) return keys;
  if (*domain == kOwnDomain) keys = {{"ExtLogging", "log more"}, {"MachineHack", "run as a fixed machine type"}};
  const auto values =
      read_device_plist(std::string(paths::kPreferencesDirectory) + '/' + *domain + std::string(kExtension));
  if (!values) return keys;
  for (const auto [key, value] : values->entries()) add_once(keys, key.text(), "");
  return keys;
}

std::vector<Candidate> ark_domains() {
  std::vector<Candidate> domains;
  for (const larry_info& row : kLiveAnswers) {
    if (!row.domain.empty()) add_once(domains, row.domain, kLive);
  }
  for (const SavedEntry& entry : saved_entries(read_saved_ark().value_or(PropertyValue::dictionary()))) {
    if (!entry.domain.empty()) add_once(domains, entry.domain, kSaved);
  }
  return domains;
}

std::vector<Candidate> ark_keys(const UnfinishedCall& call, bool every_domain) {
  std::vector<Candidate> keys;
  const std::string* chosen = find(call, "--domain");
  const std::string domain = chosen == nullptr ? "" : *chosen;
  for (const larry_info& row : kLiveAnswers) {
    if (every_domain || row.domain == domain) add_once(keys, row.key, kLive);
  }
  if (every_domain) return keys;
  const PropertyValue ark = read_saved_ark().value_or(PropertyValue::dictionary());
  for (const auto [key, value] : ark.entries()) {
    if (key.text().starts_with(domain + '-')) add_once(keys, key.text().substr(domain.size() + 1), kSaved);
  }
  return keys;
}

std::vector<Candidate> telephony_fields(const std::string& command) {
  std::vector<Candidate> fields;
  const bool errors = command.ends_with(" fail") || command.ends_with(" succeed");
  for (const std::string_view name : wire::kStateFields) {
    if (name == (errors ? wire::kSimStatusField.text() : wire::kConnectionField.text())) continue;
    fields.push_back({std::string(name)});
  }
  return fields;
}

std::vector<Candidate> known_values(const UnfinishedCall& call) {
  const std::string& command = call.command;
  const bool preferences = command.starts_with("quorvelctl preferences");
  if (call.value == "DOMAIN" && preferences) return preference_domains();
  if (call.value == "DOMAIN" && command.starts_with("quorvelctl ark")) return ark_domains();
  if (call.value == "KEY") return preferences ? preference_keys(call) : ark_keys(call, command == "quorvelctl facts");
  if (call.value == "FIELD") return telephony_fields(command);
  std::vector<Candidate> names;
  if (call.value == "NAME") {
    for (const std::string_view name : wire::kTelephonyNotifications) names.push_back({std::string(name)});
  }
  return names;
}

}  // namespace

std::vector<Candidate> candidates(const UnfinishedCall& call) {
  if (const std::string* root = find(call, "--root")) ::setenv("QUORVEL_ROOT", root->c_str(), 1);
  try {
    return known_values(call);
  } catch (const Failure&) {
    // A person who completes a word is not told about files; the command will tell.
    return {};
  }
}

}  // namespace quorvel::tools
