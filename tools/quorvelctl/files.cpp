#include "files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <cstring>

#include "common/failure.h"
#include "common/human_text.h"
#include "platform/descriptor.h"
#include "platform/file_system.h"
#include "property/binary/binary.h"
#include "property/limits.h"

namespace quorvel::tools {
namespace {

constexpr std::size_t kReadSize = 64u << 10;

}  // namespace

void fail_on(const std::string& verb, const std::string& path, Place place) {
  const int error = errno;
  std::string message = "cannot " + verb + ' ' + path + ": " + std::strerror(error);
  if (error == EACCES || error == EPERM) message += ". Try again as its owner or with sudo";
  if (error == ENOENT && place == Place::device) message += ". Check the device root (--root, QUORVEL_ROOT)";
  throw Failure{kUnreachable, std::move(message)};
}

std::string read_all(int descriptor, const std::string& path, Place place) {
  std::string bytes;
  for (;;) {
    const std::size_t before = bytes.size();
    bytes.resize(before + kReadSize);
    const ssize_t count = ::read(descriptor, bytes.data() + before, kReadSize);
    bytes.resize(before + (count > 0 ? static_cast<std::size_t>(count) : 0));
    if (count == 0) return bytes;
    if (count < 0 && errno != EINTR) fail_on("read", path, place);
  }
}

std::optional<PropertyValue> read_device_plist(const std::string& path, Links links, const std::string& consequence) {
  // Without blocking, in case somebody put a pipe there.
  const int flags = O_RDONLY | O_NONBLOCK | (links == Links::refused ? O_NOFOLLOW : 0);
  const Descriptor file(platform::open_file(path.c_str(), flags, 0));
  if (!file && errno == ENOENT) return std::nullopt;
  if (!file && errno == ELOOP) throw Failure{kUnreachable, path + " is a link, which the daemon does not follow"};
  if (!file) fail_on("open", path);
  struct stat status {};
  if (::fstat(file.get(), &status) != 0) fail_on("read", path);
  if (!S_ISREG(status.st_mode)) throw Failure{kUnreachable, path + " is not a file; move it out of the way"};
  if (status.st_size > kLargestFile) throw Failure{kUnreachable, path + " is too large for a property list"};
  return parse_plist(read_all(file.get(), path), path, consequence);
}

PropertyValue parse_plist(const std::string& bytes, const std::string& path, const std::string& consequence) {
  PropertyValue value = read_binary(std::as_bytes(std::span(bytes)), Mutability::mutable_containers);
  if (value) return value;
  throw Failure{kUnreachable, path + " does not hold a binary property list" + consequence};
}

bool is_installed_system() {
  const char* root = std::getenv("QUORVEL_ROOT");
  return root == nullptr || std::string_view(root) == "/";
}

std::string ordinary_path(const std::string& device_path) {
  return shell_word(is_installed_system() ? device_path : std::getenv("QUORVEL_ROOT") + device_path);
}

std::string how_to_start(const std::string& program) {
  if (is_installed_system()) return "Start it with: sudo systemctl start " + program;
  return "Start " + program + " with the same device root (--root, QUORVEL_ROOT)";
}

std::string plist_bytes(const PropertyValue& value) {
  ByteBuffer bytes;
  if (!write_binary(value, bytes))
    throw Failure{kUnreachable, "the value is too large or too deep for a property list"};
  return {reinterpret_cast<const char*>(bytes.data()), bytes.size()};
}

void write_all(int descriptor, const std::string& bytes, const std::string& path, Place place) {
  std::size_t done = 0;
  while (done < bytes.size()) {
    const ssize_t count = ::write(descriptor, bytes.data() + done, bytes.size() - done);
    if (count < 0 && errno != EINTR) fail_on("write", path, place);
    if (count > 0) done += static_cast<std::size_t>(count);
  }
}

void make_device_directories(const std::string& path) {
  for (std::size_t end = path.find('/', 1);; end = path.find('/', end + 1)) {
    const std::string part = path.substr(0, end);
    if (platform::make_directory(part.c_str(), 0755) != 0 && errno != EEXIST) fail_on("make the directory", part);
    if (end == std::string::npos) return;
  }
}

}  // namespace quorvel::tools
