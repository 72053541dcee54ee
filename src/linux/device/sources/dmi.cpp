#include <algorithm>

#include "linux/device/sources/reading.h"
#include "linux/device/sources/sources.h"
#include "platform/device_paths.h"

namespace quorvel::platform::host {

namespace {

[[nodiscard]] SourcePath entry(std::string_view name) noexcept { return SourcePath(paths::kFirmwareTable, name); }

}  // namespace

DeviceAnswer dmi_product_name() noexcept { return firmware_text(entry("product_name")); }
DeviceAnswer dmi_board_name() noexcept { return firmware_text(entry("board_name")); }
DeviceAnswer dmi_product_sku() noexcept { return firmware_text(entry("product_sku")); }
DeviceAnswer dmi_product_serial() noexcept { return firmware_serial(entry("product_serial")); }
DeviceAnswer dmi_board_serial() noexcept { return firmware_serial(entry("board_serial")); }
DeviceAnswer dmi_bios_version() noexcept { return firmware_text(entry("bios_version")); }

// This maker writes the name that people know into the version.
DeviceAnswer dmi_marketing_version() noexcept {
  constexpr std::string_view kMaker = "LENOVO";
  const SourceFile vendor(entry("sys_vendor"));
  const auto upper = [](char c) { return c >= 'a' && c <= 'z' ? static_cast<char>(c - 'a' + 'A') : c; };
  const bool is_maker = std::ranges::equal(vendor.text(), kMaker, {}, upper);
  return is_maker ? firmware_text(entry("product_version")) : DeviceAnswer{};
}

}  // namespace quorvel::platform::host
