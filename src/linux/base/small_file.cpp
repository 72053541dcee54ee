#include "linux/base/small_file.h"

#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "linux/base/error_line.h"
#include "platform/file_system.h"
#include "property/binary/binary.h"

namespace quorvel::platform::host {

namespace {

constexpr std::size_t kMaximumPropertyList = 16u << 20;
constexpr std::size_t kLeastRead = 4096;

// Reads once behind the present content of `out`. The number of bytes, 0 at the end, -1 on failure.
[[nodiscard]] ssize_t read_more(int file, ByteBuffer& out) noexcept {
  const std::size_t size = out.size();
  const std::size_t room = std::max(out.capacity() - size, kLeastRead);
  if (!out.resize(size + room)) return -1;
  ssize_t count = ::read(file, out.data() + size, room);
  while (count < 0 && errno == EINTR) count = ::read(file, out.data() + size, room);
  static_cast<void>(out.resize(size + static_cast<std::size_t>(std::max<ssize_t>(count, 0))));
  return count;
}

}  // namespace

bool read_small_file(const Descriptor& file, std::size_t maximum, ByteBuffer& out, LongFile long_file) noexcept {
  struct stat status;
  if (::fstat(file.get(), &status) != 0 || !S_ISREG(status.st_mode)) return false;
  auto announced = static_cast<std::size_t>(std::max<off_t>(status.st_size, 0));
  if (long_file == LongFile::cut) announced = std::min(announced, maximum);
  // Files of the kernel announce any size; a byte more than the content lets one read find the end.
  if (announced > maximum || !out.reserve(announced + 1)) return false;
  ssize_t count = 1;
  while (count > 0 && out.size() <= maximum) count = read_more(file.get(), out);
  if (long_file == LongFile::cut && out.size() > maximum) return count > 0 && out.resize(maximum);
  return count == 0;
}

PropertyValue read_file_entry(const char* path, std::string_view key, std::atomic<bool>& told) noexcept {
  const Descriptor file(open_file(path, kSmallFileFlags, 0));
  if (!file) {
    const bool absent = errno == ENOENT || errno == ENOTDIR;
    if (!told.exchange(!absent) && !absent) print_system_error("cannot open %s", path);
    return nullptr;
  }
  ByteBuffer content;
  PropertyValue list;
  if (read_small_file(file, kMaximumPropertyList, content)) list = read_binary(content.bytes(), Mutability::immutable);
  const bool usable = list.is_dictionary();
  if (!told.exchange(!usable) && !usable)
    print_error_line("%s does not hold a dictionary as a binary property list", path);
  return list.get(key);
}

}  // namespace quorvel::platform::host
