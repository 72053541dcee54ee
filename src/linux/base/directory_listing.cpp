#include "platform/directory_listing.h"

#include <dirent.h>
#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <string_view>

#include "platform/file_system.h"

namespace quorvel::platform {

namespace {

constexpr std::size_t kMostEntries = 4096;

// Adds the names with their NULs and returns how many there are; 0 when memory runs out.
[[nodiscard]] std::size_t read_names(DIR* directory, ByteBuffer& names) noexcept {
  std::size_t count = 0;
  while (count < kMostEntries) {
    const dirent* entry = ::readdir(directory);
    if (entry == nullptr) break;
    const std::string_view name(entry->d_name);
    if (name == "." || name == "..") continue;
    if (!names.append(name.data(), name.size() + 1)) return 0;
    ++count;
  }
  return count;
}

}  // namespace

DirectoryListing::DirectoryListing(const char* path) noexcept {
  const int opened = open_file(path, O_RDONLY | O_DIRECTORY | O_NONBLOCK, 0);
  if (opened < 0) return;
  DIR* directory = ::fdopendir(opened);
  if (directory == nullptr) {
    ::close(opened);
    return;
  }
  const std::size_t count = read_names(directory, names_);
  ::closedir(directory);
  if (count == 0 || !order_.resize(count * sizeof(const char*))) return;
  auto* order = reinterpret_cast<const char**>(order_.data());
  const auto* name = reinterpret_cast<const char*>(names_.data());
  for (std::size_t i = 0; i < count; ++i) {
    order[i] = name;
    name += std::strlen(name) + 1;
  }
  std::sort(order, order + count, [](const char* left, const char* right) { return std::strcmp(left, right) < 0; });
}

}  // namespace quorvel::platform
