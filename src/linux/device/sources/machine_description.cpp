#include "linux/device/sources/machine_id.h"
#include "linux/device/sources/reading.h"
#include "linux/device/sources/sha256.h"
#include "linux/device/sources/sources.h"
#include "platform/device_paths.h"

namespace quorvel::platform::host {

namespace {

// Chosen once, at random, and never changed: every device's identifier rests on it.
constexpr unsigned char kApplication[16] = {0xa2, 0x0e, 0xe1, 0x13, 0xc6, 0xdf, 0x46, 0x48,
                                            0xbe, 0xf3, 0x5f, 0xbf, 0x5e, 0x99, 0xb1, 0x48};

[[nodiscard]] DeviceAnswer assignment(const char* path, std::string_view name) noexcept {
  const SourceFile file(path);
  ByteBuffer value;
  if (!find_assignment(file.content(), name, value)) return {};
  const std::string_view whole(reinterpret_cast<const char*>(value.data()), value.size());
  const std::string_view text = first_text(whole);
  // A NUL inside would cut the text short, which nobody meant.
  return whole.find('\0') == std::string_view::npos ? text_answer(text, path) : DeviceAnswer{};
}

// The distribution's own file counts only where the administrator's is missing; they are never merged.
[[nodiscard]] DeviceAnswer release(std::string_view name) noexcept {
  const bool is_there = something_stands_at(SourcePath(paths::kOsRelease));
  return assignment(is_there ? paths::kOsRelease : paths::kDistributionOsRelease, name);
}

}  // namespace

DeviceAnswer hardware_model_of_administrator() noexcept { return assignment(paths::kMachineInfo, "HARDWARE_MODEL"); }
DeviceAnswer hardware_sku_of_administrator() noexcept { return assignment(paths::kMachineInfo, "HARDWARE_SKU"); }
DeviceAnswer system_version() noexcept { return release("VERSION_ID"); }
DeviceAnswer system_build() noexcept { return release("BUILD_ID"); }
DeviceAnswer system_image() noexcept { return release("IMAGE_VERSION"); }

DeviceIdentifier derive_identifier(std::span<const std::byte, 16> machine,
                                   std::span<const std::byte, 16> application) noexcept {
  constexpr char kDigits[] = "0123456789abcdef";
  Digest digest = hmac_sha256(machine, application);
  digest[6] = (digest[6] & std::byte{0x0f}) | std::byte{0x40};
  digest[8] = (digest[8] & std::byte{0x3f}) | std::byte{0x80};
  DeviceIdentifier text;
  for (std::size_t i = 0; i < 16; ++i) {
    text[2 * i] = kDigits[std::to_integer<unsigned>(digest[i]) >> 4];
    text[2 * i + 1] = kDigits[std::to_integer<unsigned>(digest[i]) & 15];
  }
  return text;
}

DeviceAnswer derived_device_id() noexcept {
  const SourceFile file(paths::kMachineId);
  std::byte machine[16];
  if (!parse_machine_id(file.content(), machine)) return {};
  const DeviceIdentifier text = derive_identifier(machine, std::as_bytes(std::span(kApplication)));
  return text_answer({text.data(), text.size()}, "derived from /etc/machine-id");
}

}  // namespace quorvel::platform::host
