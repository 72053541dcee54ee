#include <cstring>

#include "linux/device/sources/reading.h"
#include "linux/device/sources/sources.h"
#include "platform/device_paths.h"

namespace quorvel::platform::host {

namespace {

// A kernel may make an empty tree on any machine; a virtual machine's says nothing about a device.
constexpr std::string_view kNoDevice = "linux,dummy-virt";

[[nodiscard]] SourcePath property(std::string_view name) noexcept { return SourcePath(paths::kDeviceTree, name); }

// The list of what the machine is compatible with, from the board to its processor: empty where the tree is no
// device's.
[[nodiscard]] std::string_view compatible_list(const SourceFile& file) noexcept {
  return first_text(file.content()).empty() || first_text(file.content()) == kNoDevice ? std::string_view{}
                                                                                       : file.content();
}

[[nodiscard]] bool describes_a_device() noexcept {
  const SourceFile compatible(property("compatible"));
  return !compatible_list(compatible).empty();
}

[[nodiscard]] DeviceAnswer listed_answer(std::string_view text) noexcept {
  const std::string_view clean = first_text(text);
  return is_junk(clean) ? DeviceAnswer{} : text_answer(clean, property("compatible").text());
}

// The address that a property of the node behind an alias holds, in either order of its bytes.
[[nodiscard]] DeviceAnswer node_address(std::string_view alias, std::string_view name, bool is_reversed) noexcept {
  const SourceFile node(SourcePath(paths::kDeviceTree, "aliases", alias));
  if (!node.text().starts_with('/') || node.text().find("..") != std::string_view::npos) return {};
  const SourcePath path(paths::kDeviceTree, node.text().substr(1), name);
  const SourceFile file(path);
  std::byte bytes[6];
  if (file.content().size() != sizeof bytes) return {};
  for (std::size_t i = 0; i < sizeof bytes; ++i) {
    bytes[is_reversed ? 5 - i : i] = static_cast<std::byte>(file.content()[i]);
  }
  char text[kAddressLength];
  write_address(bytes, text);
  const std::string_view address(text, sizeof text);
  return is_network_address(address) ? text_answer(address, path.text()) : DeviceAnswer{};
}

}  // namespace

DeviceAnswer device_tree_board() noexcept {
  const SourceFile file(property("compatible"));
  return listed_answer(compatible_list(file));
}

// A single text is the board, not its platform.
DeviceAnswer device_tree_platform() noexcept {
  const SourceFile file(property("compatible"));
  std::string_view list = compatible_list(file);
  std::string_view last;
  std::size_t count = 0;
  while (take_listed_text(list, last)) ++count;
  return count < 2 ? DeviceAnswer{} : listed_answer(last);
}

DeviceAnswer device_tree_model() noexcept {
  return describes_a_device() ? firmware_text(property("model")) : DeviceAnswer{};
}

DeviceAnswer device_tree_serial() noexcept {
  return describes_a_device() ? firmware_serial(property("serial-number")) : DeviceAnswer{};
}

DeviceAnswer device_tree_boot_loader() noexcept {
  return describes_a_device() ? firmware_text(property("chosen/u-boot,version")) : DeviceAnswer{};
}

DeviceAnswer device_tree_ethernet_address() noexcept {
  if (!describes_a_device()) return {};
  const DeviceAnswer answer = node_address("ethernet0", "local-mac-address", false);
  return answer.value ? answer : node_address("ethernet0", "mac-address", false);
}

DeviceAnswer device_tree_bluetooth_address() noexcept {
  return describes_a_device() ? node_address("bluetooth0", "local-bd-address", true) : DeviceAnswer{};
}

DeviceAnswer device_tree_baseband() noexcept {
  const SourcePath node = property("baseband");
  const bool is_there = describes_a_device() && something_stands_at(node);
  return is_there ? answer_from(PropertyValue::boolean(true), node.text()) : DeviceAnswer{};
}

}  // namespace quorvel::platform::host
