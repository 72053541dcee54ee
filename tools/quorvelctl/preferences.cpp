#include <fcntl.h>
#include <sys/file.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <chrono>
#include <memory>
#include <optional>
#include <thread>

#include "commands.h"
#include "common/human_text.h"
#include "files.h"
#include "output.h"
#include "platform/descriptor.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"

namespace quorvel::tools {
namespace {

using namespace std::chrono_literals;

constexpr const char* kDirectory = paths::kPreferencesDirectory;
constexpr std::size_t kLongestDomain = 200;
constexpr auto kLockPatience = 10s;

struct PreferenceWords {
  std::string domain;
  std::string key;
  std::string json;
  bool raw = false;
};

std::string path_of(const std::string& domain) {
  const bool plain = domain.find('/') == std::string::npos && displayable(domain) == domain;
  if (!domain.empty() && domain[0] != '.' && plain && domain.size() <= kLongestDomain) {
    return std::string(kDirectory) + '/' + domain + ".plist";
  }
  throw Failure{kWrongWords, "\"" + domain +
                                 "\" cannot be a domain. A domain is a reverse-DNS name of at most 200 "
                                 "bytes without a slash or control character, such as com.Orvane.quorveld"};
}

std::optional<PropertyValue> read_domain(const std::string& domain) {
  const std::string path = path_of(domain);
  std::optional<PropertyValue> values = read_device_plist(path);
  if (!values || values->is_dictionary()) return values;
  throw Failure{kUnreachable, path + " is not a dictionary; move it out of the way and try again"};
}

// Writers take turns by locking the directory, which leaves nothing behind.
Descriptor lock_directory() {
  make_device_directories(kDirectory);
  Descriptor directory(platform::open_file(kDirectory, O_RDONLY | O_DIRECTORY, 0));
  if (!directory) fail_on("open", kDirectory);
  const auto end = std::chrono::steady_clock::now() + kLockPatience;
  while (::flock(directory.get(), LOCK_EX | LOCK_NB) != 0) {
    if (errno != EWOULDBLOCK && errno != EINTR) fail_on("lock", kDirectory);
    if (std::chrono::steady_clock::now() > end) {
      throw Failure{kUnreachable, std::string(kDirectory) + " is locked by another program; try again when it is done"};
    }
    std::this_thread::sleep_for(10ms);
  }
  return directory;
}

// A file that is replaced keeps its mode, and its owner where that is allowed.
void keep_ownership(int file, const std::string& path) {
  struct stat status {};
  if (platform::file_status(path.c_str(), &status) != 0) return;
  if (::fchown(file, status.st_uid, status.st_gid) != 0) note("the owner of " + path + " changes");
  if (::fchmod(file, status.st_mode & 07777) != 0) fail_on("set the mode of", path);
}

// Whoever reads the domain meanwhile, or after a power cut, sees the old file or the new one.
void replace_domain(const std::string& domain, const PropertyValue& values) {
  const std::string path = path_of(domain);
  const std::string temporary = std::string(kDirectory) + "/." + domain + ".plist.new";
  const std::string bytes = plist_bytes(values);
  platform::remove_file(temporary.c_str());
  const Descriptor file(platform::open_file(temporary.c_str(), O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW, 0644));
  if (!file) fail_on("create", temporary);
  try {
    write_all(file.get(), bytes, temporary);
    keep_ownership(file.get(), path);
    if (platform::flush_file(file.get()) != 0) fail_on("write", temporary);
    if (platform::rename_file(temporary.c_str(), path.c_str()) != 0) fail_on("replace", path);
  } catch (const Failure&) {
    platform::remove_file(temporary.c_str());
    throw;
  }
  if (platform::flush_directory(kDirectory) != 0) fail_on("flush", kDirectory);
}

std::string command_for(const char* verb, const PreferenceWords& words) {
  return std::string("quorvelctl preferences ") + verb + ' ' + shell_word(words.domain);
}

int list_preferences(const PreferenceWords& words, const Form& form) {
  const std::optional<PropertyValue> values = read_domain(words.domain);
  if (values) return print_value(*values, form);
  return print_no_value("the domain \"" + words.domain +
                            "\" has no preferences. Set one with: " + command_for("set", words) + " KEY JSON",
                        form.json);
}

int no_such_key(const PreferenceWords& words, const Form& form) {
  return print_no_value("the domain \"" + words.domain + "\" has no \"" + words.key +
                            "\". See what it has with: " + command_for("list", words),
                        form.json);
}

int get_preference(const PreferenceWords& words, const Form& form) {
  const std::optional<PropertyValue> values = read_domain(words.domain);
  if (!values || !values->get(words.key)) return no_such_key(words, form);
  return print_value(values->get(words.key), form);
}

int set_preference(const PreferenceWords& words, const Form& form) {
  const PropertyValue value = value_of_word(words.json, "JSON");
  if (!value) throw Failure{kWrongWords, "null is no value; to take a key away use: quorvelctl preferences delete"};
  const PropertyValue key = PropertyValue::string(words.key);
  if (!key) throw Failure{kWrongWords, "the key is not valid UTF-8"};
  static_cast<void>(path_of(words.domain));
  const Descriptor lock = lock_directory();
  PropertyValue values = read_domain(words.domain).value_or(PropertyValue::dictionary());
  put(values, words.key, value);
  replace_domain(words.domain, values);
  return print_change({{"domain", words.domain}, {"key", words.key}}, "value", value, form.json);
}

int delete_preference(const PreferenceWords& words, const Form& form) {
  const std::optional<PropertyValue> present = read_domain(words.domain);
  if (!present || !present->get(words.key)) return no_such_key(words, form);
  const Descriptor lock = lock_directory();
  PropertyValue values = read_domain(words.domain).value_or(PropertyValue::dictionary());
  const PropertyValue value = values.get(words.key);
  if (!values.remove(words.key)) return no_such_key(words, form);
  replace_domain(words.domain, values);
  return print_change({{"domain", words.domain}, {"key", words.key}}, "deleted", value, form.json);
}

}  // namespace

void add_preferences(CLI::App& app, CommandLine& line) {
  CLI::App& preferences =
      add_group(app, {"preferences", "Show and change the preferences store",
                      "  quorvelctl preferences list com.Orvane.quorveld\n"
                      "  quorvelctl preferences set com.Orvane.quorveld ExtLogging 1\n"
                      "  quorvelctl preferences delete com.Orvane.quorveld ExtLogging\n\n"
                      "The daemon reads its own preferences when it starts: restart it after a change."});
  auto words = std::make_shared<PreferenceWords>();
  const auto add = [&](const char* name, const char* summary, const char* example, bool key, auto run) -> CLI::App& {
    CLI::App& command = add_command(preferences, {name, summary, example});
    add_word(command, "DOMAIN", words->domain, "Reverse-DNS name, such as com.Orvane.quorveld");
    if (key) add_word(command, "KEY", words->key, "The key");
    when_chosen(command, [&line, words, run] {
      line.run = [&line, words, run] { return run(*words, Form{line.json, words->raw}); };
    });
    return command;
  };
  add("list", "Print all of a domain", "  quorvelctl preferences list com.Orvane.quorveld --json", false,
      list_preferences);
  CLI::App& get = add("get", "Print one value", "  quorvelctl preferences get com.Orvane.quorveld MachineHack", true,
                      get_preference);
  add_raw(get, words->raw);
  CLI::App& set = add("set", "Set one value", "  quorvelctl preferences set com.Orvane.quorveld MachineHack '\"q35\"'",
                      true, set_preference);
  add_word(set, "JSON", words->json, "The value as JSON; a text needs its double quotes: '\"text\"'");
  add("delete", "Take one value away", "  quorvelctl preferences delete com.Orvane.quorveld MachineHack", true,
      delete_preference);
}

}  // namespace quorvel::tools
