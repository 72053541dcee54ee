#include "platform/hardware_registry.h"

#include <fcntl.h>

#include <cerrno>
#include <climits>
#include <cstdio>
#include <cstring>

#include "linux/base/small_file.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"

namespace quorvel::platform {

namespace {

constexpr std::string_view kPlane = "IODeviceTree:/";
constexpr std::size_t kMaximumProperty = 64u << 10;

// A property is a file of the entry itself, so its name is one path component.
[[nodiscard]] bool is_property_name(std::string_view name) noexcept {
  return !name.empty() && name.size() <= NAME_MAX && name != "." && name != ".." &&
         name.find_first_of(std::string_view("/\0", 2)) == std::string_view::npos;
}

[[nodiscard]] Descriptor open_property(int directory, const char* name) noexcept {
  // A link's absolute target would leave the device root.
  constexpr int flags = host::kSmallFileFlags | O_NOFOLLOW;
  int file = ::openat(directory, name, flags);
  while (file < 0 && errno == EINTR) file = ::openat(directory, name, flags);
  return Descriptor(file);
}

}  // namespace

RegistryEntry RegistryEntry::open(const char* path) noexcept {
  RegistryEntry entry;
  const std::string_view name(path);
  if (!name.starts_with(kPlane)) return entry;
  char directory[kPathSize];
  const int length = std::snprintf(directory, sizeof directory, "%s/%s", paths::kDeviceTree, path + kPlane.size());
  if (length < 0 || static_cast<std::size_t>(length) >= sizeof directory) return entry;
  entry.directory_ = Descriptor(open_file(directory, O_PATH | O_DIRECTORY, 0));
  return entry;
}

PropertyValue RegistryEntry::copy_property(std::string_view name) const noexcept {
  if (!directory_ || !is_property_name(name)) return nullptr;
  char file_name[NAME_MAX + 1] = {};
  std::memcpy(file_name, name.data(), name.size());
  const Descriptor file = open_property(directory_.get(), file_name);
  ByteBuffer content;
  if (!file || !host::read_small_file(file, kMaximumProperty, content, host::LongFile::cut)) return nullptr;
  return PropertyValue::data(content.bytes());
}

}  // namespace quorvel::platform
