#include <sys/utsname.h>

#include <algorithm>

#include "linux/device/sources/reading.h"
#include "linux/device/sources/sources.h"
#include "platform/device_paths.h"

namespace quorvel::platform::host {

namespace {

constexpr std::string_view kBlanks = " \t";
constexpr std::size_t kShortestSerial = 3;

[[nodiscard]] DeviceAnswer serial_answer(std::string_view text, const char* origin) noexcept {
  const std::string_view serial = first_text(text);
  return serial.size() < kShortestSerial || is_junk(serial) ? DeviceAnswer{} : text_answer(serial, origin);
}

}  // namespace

DeviceAnswer chip_family() noexcept { return firmware_text(SourcePath(paths::kSystemOnChip, "family")); }

DeviceAnswer chip_id() noexcept {
  const SourcePath path(paths::kSystemOnChip, "soc_id");
  const auto id = SourceFile(path).integer();
  return id ? answer_from(PropertyValue::integer(*id), path.text()) : DeviceAnswer{};
}

DeviceAnswer unique_chip_id() noexcept {
  const SourcePath path(paths::kSystemOnChip, "serial_number");
  const auto number = parse_chip_number(SourceFile(path).text());
  return number && *number != 0 ? answer_from(PropertyValue::unsigned_integer(*number), path.text()) : DeviceAnswer{};
}

// A line "Serial : 02c00081", which processors of phones have.
DeviceAnswer processor_serial() noexcept {
  const SourceFile file(paths::kProcessors);
  for (std::string_view rest = file.content(); !rest.empty();) {
    const std::size_t end = std::min(rest.find('\n'), rest.size());
    const std::string_view line = rest.substr(0, end);
    rest.remove_prefix(std::min(end + 1, rest.size()));
    const std::size_t colon = line.find(':');
    if (colon == std::string_view::npos || first_text(line.substr(0, colon)) != "Serial") continue;
    return serial_answer(line.substr(colon + 1), paths::kProcessors);
  }
  return {};
}

DeviceAnswer boot_serial() noexcept {
  constexpr std::string_view kOption = "androidboot.serialno=";
  const SourceFile file(paths::kCommandLine);
  for (std::string_view rest = file.text(); !rest.empty();) {
    const std::size_t end = std::min(rest.find_first_of(kBlanks), rest.size());
    const std::string_view word = rest.substr(0, end);
    rest.remove_prefix(std::min(end + 1, rest.size()));
    if (word.starts_with(kOption)) return serial_answer(word.substr(kOption.size()), paths::kCommandLine);
  }
  return {};
}

DeviceAnswer processor_architecture() noexcept {
  struct utsname system;
  return ::uname(&system) == 0 ? text_answer(system.machine, "uname") : DeviceAnswer{};
}

}  // namespace quorvel::platform::host
