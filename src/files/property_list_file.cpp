#include "files/property_list_file.h"

#include <fcntl.h>
#include <unistd.h>

#include <cerrno>

#include "files/error_text.h"
#include "files/safe_open.h"
#include "log/daemon_log.h"
#include "platform/descriptor.h"
#include "platform/flush_file.h"
#include "platform/lock.h"
#include "property/binary/binary.h"

namespace quorvel {
namespace {

constexpr const char* kStore = "store_dict";
constexpr const char* kLoad = "_load_dict";

// A read delivers no more than this, so a larger file can never be read whole.
constexpr off_t kLargestRead = 0x7ffff000;

// Files above this size are loaded one at a time, so that many requests for a huge one cannot use up the memory.
constexpr off_t kLargeFile = off_t{64} << 20;
Lock large_load_lock;

// Both start from a clean error number: a transfer that falls short without an error must not be blamed on an older
// one.
bool write_whole(const Descriptor& file, std::span<const std::byte> bytes) noexcept {
  ssize_t written = 0;
  errno = 0;
  do {
    written = ::write(file.get(), bytes.data(), bytes.size());
  } while (written < 0 && errno == EINTR);
  return written == static_cast<ssize_t>(bytes.size());
}

bool read_whole(const Descriptor& file, ByteBuffer& buffer) noexcept {
  ssize_t count = 0;
  errno = 0;
  do {
    count = ::read(file.get(), buffer.data(), buffer.size());
  } while (count < 0 && errno == EINTR);
  return count == static_cast<ssize_t>(buffer.size());
}

enum class Durability { ordinary, flushed };

int store(const char* path, const PropertyValue& value, const OmittedEntries& omitted, Durability durability) noexcept {
  ByteBuffer bytes;
  if (!write_binary(value, bytes, omitted)) {
    daemon_log(0, kStore, "Could not serialize dictionary to stream");
    return -1;
  }
  const Descriptor file(_safe_open(path, O_WRONLY | O_CREAT | O_TRUNC, 0644, kRegularFile));
  if (!file) {
    const ErrorText error;
    daemon_log(0, kStore, "Could not create %s: %s", path, error.text());
    log_file_and_dir_info(path);
    return -1;
  }
  // What closing the file could still report is a delayed failure of the write, which the flush has reported already.
  if (write_whole(file, bytes.bytes()) &&
      (durability == Durability::ordinary || platform::flush_file(file.get()) == 0)) {
    return 0;
  }
  const ErrorText error;
  daemon_log(0, kStore, "Could not write to %s: %s", path, error.text());
  log_file_and_dir_info(path);
  return -1;
}

PropertyValue read_value(const Descriptor& file, const char* path, std::size_t size, Mutability mutability,
                         CheckedBytes* checked) noexcept {
  ByteBuffer buffer;
  if (!buffer.resize(size)) {
    daemon_log(0, kLoad, "Could not allocate buffer");
    return {};
  }
  if (!read_whole(file, buffer)) {
    const ErrorText error;
    daemon_log(0, kLoad, "Could not read %s: %s", path, error.text());
    return {};
  }
  if (checked != nullptr && (*checked = CheckedBytes::check(buffer))) return {};
  PropertyValue value = read_binary(buffer.bytes(), mutability);
  if (!value) daemon_log(0, kLoad, "Could not create dictionary from stream");
  return value;
}

PropertyValue load(const char* path, Mutability mutability, CheckedBytes* checked) noexcept {
  const Descriptor file(_safe_open(path, O_RDONLY, 0, kRegularFile));
  if (!file) {
    const ErrorText error;
    daemon_log(0, kLoad, "Could not open %s: %s", path, error.text());
    log_file_and_dir_info(path);
    return {};
  }
  struct stat status;
  if (::fstat(file.get(), &status) != 0) {
    const ErrorText error;
    daemon_log(0, kLoad, "Could not fstat %s: %s", path, error.text());
    log_file_and_dir_info(path);
    return {};
  }
  if (status.st_size > kLargestRead) {
    daemon_log(0, kLoad, "too big for our purposes");
    return {};
  }
  const auto size = static_cast<std::size_t>(status.st_size);
  if (status.st_size <= kLargeFile) return read_value(file, path, size, mutability, checked);
  const LockHold one_at_a_time(large_load_lock);
  return read_value(file, path, size, mutability, checked);
}

}  // namespace

int store_dict(const char* path, const PropertyValue& value) noexcept {
  return store(path, value, {}, Durability::ordinary);
}

int store_dict_durably(const char* path, const PropertyValue& value, const OmittedEntries& omitted) noexcept {
  return store(path, value, omitted, Durability::flushed);
}

PropertyValue _load_dict(const char* path, bool immutable) noexcept {
  return load(path, immutable ? Mutability::immutable : Mutability::mutable_containers, nullptr);
}
PropertyValue load_dict(const char* path) noexcept { return _load_dict(path, true); }
PropertyValue load_mutable_dict(const char* path) noexcept { return _load_dict(path, false); }
PropertyValue load_dict_or_bytes(const char* path, CheckedBytes& bytes) noexcept {
  return load(path, Mutability::immutable, &bytes);
}

}  // namespace quorvel
