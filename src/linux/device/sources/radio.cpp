#include "linux/device/sources/reading.h"
#include "linux/device/sources/sources.h"
#include "platform/device_paths.h"
#include "platform/directory_listing.h"

namespace quorvel::platform::host {

namespace {

// How many radio switches of a type there are, and whether they let the radio send.
struct Switches {
  int closed = 0;
  int open = 0;
};

[[nodiscard]] bool is_set(std::string_view name, std::string_view file) noexcept {
  return SourceFile(SourcePath(paths::kRadioSwitches, name, file)).integer() == 1;
}

[[nodiscard]] Switches count_switches(bool (*counts)(std::string_view type)) noexcept {
  Switches switches;
  const DirectoryListing listing(paths::kRadioSwitches);
  for (const char* name : listing) {
    const SourceFile type(SourcePath(paths::kRadioSwitches, name, "type"));
    if (!counts(type.text())) continue;
    ++(is_set(name, "soft") || is_set(name, "hard") ? switches.closed : switches.open);
  }
  return switches;
}

[[nodiscard]] bool has_switch(bool (*counts)(std::string_view type)) noexcept {
  const Switches switches = count_switches(counts);
  return switches.closed + switches.open > 0;
}

[[nodiscard]] bool has_entries(const char* directory) noexcept { return !DirectoryListing(directory).empty(); }

[[nodiscard]] bool some_interface(bool (*test)(std::string_view name)) noexcept {
  const DirectoryListing listing(paths::kNetworkInterfaces);
  for (const char* name : listing) {
    if (test(name)) return true;
  }
  return false;
}

}  // namespace

// Receivers of positions, broadcasts and tags do not count.
DeviceAnswer airplane_mode() noexcept {
  const Switches switches =
      count_switches([](std::string_view type) { return type == "wlan" || type == "bluetooth" || type == "wwan"; });
  if (switches.closed + switches.open == 0) return {};
  return answer_from(PropertyValue::boolean(switches.open == 0), paths::kRadioSwitches);
}

DeviceAnswer has_wireless() noexcept {
  const auto yes = [](const char* origin) { return answer_from(PropertyValue::boolean(true), origin); };
  if (has_switch([](std::string_view type) { return type == "wlan"; })) return yes(paths::kRadioSwitches);
  if (has_entries(paths::kWirelessDevices)) return yes(paths::kWirelessDevices);
  const auto has_phy = [](std::string_view name) {
    return something_stands_at(SourcePath(paths::kNetworkInterfaces, name, "phy80211"));
  };
  if (some_interface(has_phy)) return yes(paths::kNetworkInterfaces);
  // Only a list that shows a physical interface is known not to be hidden.
  const auto is_physical = [](std::string_view name) {
    return something_stands_at(SourcePath(paths::kNetworkInterfaces, name, "device"));
  };
  if (!some_interface(is_physical)) return {};
  return answer_from(PropertyValue::boolean(false), paths::kNetworkInterfaces);
}

DeviceAnswer has_modem() noexcept {
  const auto yes = [](const char* origin) { return answer_from(PropertyValue::boolean(true), origin); };
  if (has_entries(paths::kModems)) return yes(paths::kModems);
  if (has_switch([](std::string_view type) { return type == "wwan"; })) return yes(paths::kRadioSwitches);
  const auto is_modem = [](std::string_view name) {
    return has_line(SourceFile(SourcePath(paths::kNetworkInterfaces, name, "uevent")).content(), "DEVTYPE=wwan");
  };
  return some_interface(is_modem) ? yes(paths::kNetworkInterfaces) : DeviceAnswer{};
}

// Only old kernels have the file.
DeviceAnswer bluetooth_address() noexcept {
  const SourcePath path(paths::kBluetoothAdapter, "address");
  const SourceFile file(path);
  return is_network_address(file.text()) ? text_answer(file.text(), path.text()) : DeviceAnswer{};
}

}  // namespace quorvel::platform::host
