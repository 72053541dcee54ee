// What `status` sees in files: the saved data ark and the log.
#include <sys/stat.h>

#include <optional>
#include <utility>

#include "common/failure.h"
#include "common/human_text.h"
#include "log_files.h"
#include "output.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"
#include "saved_ark.h"
#include "status_checks.h"

namespace quorvel::tools {
namespace {

constexpr std::size_t kLongestLine = 64u << 10;

std::string duration_text(double seconds) {
  const std::pair<double, const char*> units[] = {{86'400, "day"}, {3'600, "hour"}, {60, "minute"}, {1, "second"}};
  for (const auto& [length, name] : units) {
    const auto count = static_cast<long long>(seconds / length);
    if (count > 0) return std::to_string(count) + ' ' + name + (count == 1 ? "" : "s");
  }
  return "less than a second";
}

}  // namespace

std::string since_text(double date) {
  return one_line(PropertyValue::date(date)) + ", " + duration_text(seconds_now() - date) + " ago";
}

Finding check_ark() {
  Finding finding{"ark", Verdict::well, {}, {}, PropertyValue::dictionary()};
  put(finding.facts, "file", PropertyValue::string(paths::kDataFile));
  try {
    struct stat status {};
    const std::optional<PropertyValue> ark = read_saved_ark();
    const std::int64_t count = ark ? static_cast<std::int64_t>(ark->size()) : 0;
    put(finding.facts, "entries", PropertyValue::integer(count));
    if (!ark || platform::file_status(paths::kDataFile, &status) != 0) {
      finding.lines.emplace_back("nothing is saved; the daemon saves once, at its start");
      return finding;
    }
    const double saved = static_cast<double>(status.st_mtim.tv_sec) - kSecondsTo2001;
    finding.lines.push_back(std::to_string(count) + (count == 1 ? " entry" : " entries") + ", saved " +
                            since_text(saved));
    put(finding.facts, "saved", PropertyValue::date(saved));
  } catch (const Failure& failure) {
    find_ill(finding, failure.message);
  }
  return finding;
}

Finding check_log() {
  Finding finding{"log", Verdict::well, {paths::kLogFile}, {}, PropertyValue::dictionary()};
  put(finding.facts, "file", PropertyValue::string(paths::kLogFile));
  try {
    LogFiles files;
    std::string tail;
    if (files.open()) {
      for (std::string bytes; !(bytes = files.read()).empty();) {
        tail += bytes;
        if (tail.size() > kLongestLine) tail.erase(0, tail.size() - kLongestLine);
      }
    }
    while (tail.ends_with('\n')) tail.pop_back();
    const std::string last = displayable(tail.substr(tail.rfind('\n') + 1));
    if (last.empty()) {
      find_ill(finding, "is missing or empty");
    } else {
      finding.lines.push_back(last);
      put(finding.facts, "last", PropertyValue::string(last));
    }
  } catch (const Failure& failure) {
    find_ill(finding, failure.message);
  }
  return finding;
}

}  // namespace quorvel::tools
