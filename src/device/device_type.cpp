#include "device/device_type.h"

#include <algorithm>
#include <cstring>
#include <new>
#include <string_view>

#include "files/value_helpers.h"
#include "log/daemon_log.h"
#include "platform/device_information.h"
#include "platform/device_questions.h"
#include "platform/hardware_registry.h"
#include "platform/preferences.h"

namespace quorvel {
namespace {

constexpr const char* kLabel = "__get_device_type_internal_block_invoke";

constexpr StaticText kMachineType = "q35";
constexpr StaticText kProductType = "Ondrel5,1";
constexpr std::string_view kBoardMarker = "zFPGA";
constexpr const char* kBasebandEntry = "IODeviceTree:/baseband";
constexpr StaticText kClassProperty = "class";

char lower(char c) noexcept { return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c; }

bool same_letter(char left, char right) noexcept { return lower(left) == lower(right); }

bool equal_ignoring_case(std::string_view left, std::string_view right) noexcept {
  return std::equal(left.begin(), left.end(), right.begin(), right.end(), same_letter);
}

bool contains_ignoring_case(std::string_view text, std::string_view part) noexcept {
  return std::search(text.begin(), text.end(), part.begin(), part.end(), same_letter) != text.end();
}

// The preference overrides the machine type whatever its value; a value that names another machine is only remarked.
bool preference_overrides() noexcept {
  const PropertyValue hack = platform::copy_preference("MachineHack", "com.Orvane.quorveld");
  if (!hack) return false;
  const std::string_view name = hack.text();
  if (!equal_ignoring_case(name, kMachineType.text()) && !equal_ignoring_case(name, kProductType.text())) {
    const PropertyValue machine = kMachineType;
    daemon_log(0, kLabel, "MachineHack value of '%@' is not supported; assuming %@", hack, machine);
  }
  return true;
}

void ask_product_type(DeviceTypeInfo& info) noexcept {
  info.product_type = as_string(platform::copy_device_answer(platform::QuestionName("ProductType")));
  if (!contains_ignoring_case(info.product_type.text(), kBoardMarker)) return;
  const PropertyValue machine = kMachineType;
  daemon_log(0, kLabel, "This is an FPGA, faking out product type as %@", machine);
  info.machine_override = true;
  info.product_type = nullptr;
}

void take_fixed_values(DeviceTypeInfo& info) noexcept {
  const PropertyValue machine = kMachineType;
  info.product_type = kProductType;
  daemon_log(0, kLabel, "Overriding machine type with %@ (%@)", machine, info.product_type);
  info.has_telephony = false;
  info.baseband_class = -1;
}

DeviceTypeInfo detect() noexcept {
  DeviceTypeInfo info;
  info.machine_override = preference_overrides();
  if (!info.machine_override) ask_product_type(info);
  if (info.machine_override) {
    take_fixed_values(info);
  } else {
    info.has_telephony = platform::copy_device_answer(platform::QuestionName("HasBaseband")).to_boolean();
    info.baseband_class = getDeviceTreeInt(kBasebandEntry, kClassProperty);
  }
  daemon_log(0, kLabel, "product_type: %@\n", info.product_type);
  daemon_log(0, kLabel, "has_telephony: %s", info.has_telephony ? "true" : "false");
  daemon_log(0, kLabel, "baseband_class: %d", static_cast<int>(info.baseband_class));
  return info;
}

}  // namespace

const DeviceTypeInfo& get_device_type_internal() noexcept {
  // Never destroyed: threads may still ask while the process ends.
  alignas(DeviceTypeInfo) static unsigned char storage[sizeof(DeviceTypeInfo)];
  static const DeviceTypeInfo* const info = new (storage) DeviceTypeInfo(detect());
  return *info;
}

bool has_new_baseband() noexcept { return get_device_type_internal().baseband_class > 1; }

std::int32_t getDeviceTreeInt(const char* path, const PropertyValue& name) noexcept {
  constexpr const char* kFunction = "getDeviceTreeInt";
  const auto entry = platform::RegistryEntry::open(path);
  const PropertyValue value = entry ? entry.copy_property(name.text()) : PropertyValue();
  if (!value) {
    daemon_log(0, kFunction, "no %@ property of %s", name, path);
    return -1;
  }
  std::int32_t result = -1;
  if (value.kind() != PropertyKind::data || value.bytes().size() != sizeof result) {
    daemon_log(0, kFunction, "value for %@ property of %s is invalid (%@)", name, path, value);
    return -1;
  }
  std::memcpy(&result, value.bytes().data(), sizeof result);
  return result;
}

}  // namespace quorvel
