#include <limits>

#include "linux/device/sources/reading.h"
#include "linux/device/sources/sources.h"
#include "platform/device_paths.h"
#include "platform/directory_listing.h"

namespace quorvel::platform::host {

namespace {

constexpr std::int64_t kLast = std::numeric_limits<std::int64_t>::max();

// One entry of the list of network interfaces.
class Interface {
 public:
  explicit Interface(std::string_view name) noexcept : name_(name) {}

  [[nodiscard]] SourcePath path(std::string_view file) const noexcept {
    return SourcePath(paths::kNetworkInterfaces, name_, file);
  }
  [[nodiscard]] bool has(std::string_view file) const noexcept { return something_stands_at(path(file)); }
  [[nodiscard]] std::optional<std::int64_t> integer(std::string_view file) const noexcept {
    return SourceFile(path(file)).integer();
  }
  [[nodiscard]] std::int64_t index() const noexcept { return integer("ifindex").value_or(kLast); }

  // Its address is the hardware's own: neither random, nor another interface's, nor set by somebody.
  [[nodiscard]] bool keeps_its_address() const noexcept { return integer("addr_assign_type") == 0; }

  [[nodiscard]] bool is_wired() const noexcept {
    if (!has("device") || integer("type") != 1 || has("phy80211") || has("wireless")) return false;
    return !has_line(SourceFile(path("uevent")).content(), "DEVTYPE=wwan") && !is_gadget();
  }
  [[nodiscard]] bool is_on_usb() const noexcept {
    char buffer[1024];
    return target_path(path("device/subsystem"), buffer).ends_with("/usb");
  }

 private:
  // The device's own function on a USB port that it serves.
  [[nodiscard]] bool is_gadget() const noexcept {
    char buffer[1024];
    return target_path(path("device"), buffer).find("/gadget") != std::string_view::npos;
  }

  std::string_view name_;
};

[[nodiscard]] DeviceAnswer address_in(const SourcePath& path) noexcept {
  const SourceFile file(path);
  return is_network_address(file.text()) ? text_answer(file.text(), path.text()) : DeviceAnswer{};
}

// The permanent address; one that the driver made up is equal to the random one in use.
[[nodiscard]] DeviceAnswer wireless_address_of(const Interface& candidate) noexcept {
  DeviceAnswer permanent = address_in(candidate.path("phy80211/macaddress"));
  if (!permanent.value) return candidate.keeps_its_address() ? address_in(candidate.path("address")) : DeviceAnswer{};
  const bool is_random = candidate.integer("addr_assign_type") == 1;
  const bool is_made_up = is_random && permanent.value == address_in(candidate.path("address")).value;
  return is_made_up ? DeviceAnswer{} : permanent;
}

}  // namespace

// An interface on USB comes last: docks move between machines.
DeviceAnswer ethernet_address() noexcept {
  DeviceAnswer best;
  bool best_on_usb = true;
  std::int64_t best_index = kLast;
  const DirectoryListing listing(paths::kNetworkInterfaces);
  for (const char* name : listing) {
    const Interface candidate(name);
    if (!candidate.is_wired() || !candidate.keeps_its_address()) continue;
    const bool on_usb = candidate.is_on_usb();
    const std::int64_t index = candidate.index();
    const bool is_better = on_usb != best_on_usb ? best_on_usb : index < best_index;
    if (best.value && !is_better) continue;
    DeviceAnswer answer = address_in(candidate.path("address"));
    if (!answer.value) continue;
    best = std::move(answer);
    best_on_usb = on_usb;
    best_index = index;
  }
  return best;
}

DeviceAnswer wireless_address() noexcept {
  DeviceAnswer best;
  std::int64_t best_phy = kLast;
  std::int64_t best_index = kLast;
  const DirectoryListing listing(paths::kNetworkInterfaces);
  for (const char* name : listing) {
    const Interface candidate(name);
    if (!candidate.has("phy80211") || !candidate.has("device")) continue;
    const std::int64_t phy = candidate.integer("phy80211/index").value_or(kLast);
    const std::int64_t index = candidate.index();
    const bool is_better = phy != best_phy ? phy < best_phy : index < best_index;
    if (best.value && !is_better) continue;
    DeviceAnswer answer = wireless_address_of(candidate);
    if (!answer.value) continue;
    best = std::move(answer);
    best_phy = phy;
    best_index = index;
  }
  return best;
}

DeviceAnswer card_product() noexcept {
  const DirectoryListing listing(paths::kCardDevices);
  for (const char* name : listing) {
    if (DirectoryListing(SourcePath(paths::kCardDevices, name, "net").text()).empty()) continue;
    ByteBuffer joined;
    for (const std::string_view part : {"info1", "info2", "info3", "info4"}) {
      const SourceFile info(SourcePath(paths::kCardDevices, name, part));
      if (info.text().empty()) continue;
      if ((!joined.empty() && !joined.append(" ")) || !joined.append(info.text())) return {};
    }
    const std::string_view text(reinterpret_cast<const char*>(joined.data()), joined.size());
    return text_answer(text, SourcePath(paths::kCardDevices, name).text());
  }
  return {};
}

}  // namespace quorvel::platform::host
