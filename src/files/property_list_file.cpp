#include "files/property_list_file.h"

#include <fcntl.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>

#include "files/error_text.h"
#include "files/safe_open.h"
#include "log/daemon_log.h"
#include "platform/descriptor.h"
#include "platform/file_system.h"
#include "platform/lock.h"
#include "property/binary/binary.h"
#include "property/binary/layout.h"
#include "property/limits.h"

namespace quorvel {
namespace {

constexpr const char* kStore = "store_dict";
constexpr const char* kLoad = "_load_dict";

// Files above this size are loaded one at a time, so that many requests for a huge one cannot use up the memory.
constexpr off_t kLargeFile = off_t{64} << 20;
Lock large_load_lock;

// A write that falls short goes on with the rest, which tells why when there is a reason.
bool write_whole(const Descriptor& file, std::span<const std::byte> bytes) noexcept {
  while (!bytes.empty()) {
    const ssize_t written = ::write(file.get(), bytes.data(), bytes.size());
    if (written < 0 && errno == EINTR) continue;
    if (written == 0) errno = ENOSPC;
    if (written <= 0) return false;
    bytes = bytes.subspan(static_cast<std::size_t>(written));
  }
  return true;
}

// Starts from a clean error number: a read that falls short without an error must not be blamed on an older one.
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
  // A file that is to reach stable storage is a new one: another name of what stood there keeps its content.
  const bool flushed = durability == Durability::flushed;
  if (flushed) platform::remove_file(path);
  const Descriptor file(_safe_open(path, O_WRONLY | O_CREAT | (flushed ? O_EXCL : O_TRUNC), 0644, kRegularFile));
  if (!file) {
    const ErrorText error;
    daemon_log(0, kStore, "Could not create %s: %s", path, error.text());
    log_file_and_dir_info(path);
    return -1;
  }
  // What closing the file could still report is a delayed failure of the write, which the flush has reported already.
  if (write_whole(file, bytes.bytes()) && (!flushed || platform::flush_file(file.get()) == 0)) return 0;
  const ErrorText error;
  daemon_log(0, kStore, "Could not write to %s: %s", path, error.text());
  log_file_and_dir_info(path);
  return -1;
}

bool ask_status(const Descriptor& file, const char* path, struct stat& status) noexcept {
  if (::fstat(file.get(), &status) == 0) return true;
  const ErrorText error;
  daemon_log(0, kLoad, "Could not fstat %s: %s", path, error.text());
  log_file_and_dir_info(path);
  return false;
}

bool is_unchanged(const Descriptor& file, const struct stat& before) noexcept {
  struct stat now;
  return ::fstat(file.get(), &now) == 0 && now.st_size == before.st_size &&
         now.st_mtim.tv_sec == before.st_mtim.tv_sec && now.st_mtim.tv_nsec == before.st_mtim.tv_nsec;
}

// Reads a file whole. One that somebody writes to meanwhile may come out as a mix of old and new bytes: it is read once
// more.
bool read_steady(const Descriptor& file, const char* path, struct stat status, ByteBuffer& buffer) noexcept {
  const off_t first_size = status.st_size;  // a file may not become one that has to wait for its turn
  for (int tries = 0;; ++tries) {
    if (!buffer.resize(static_cast<std::size_t>(status.st_size))) {
      daemon_log(0, kLoad, "Could not allocate buffer");
      return false;
    }
    const bool is_whole = read_whole(file, buffer);
    const ErrorText error;
    if (tries == 1 || is_unchanged(file, status)) {
      if (!is_whole) daemon_log(0, kLoad, "Could not read %s: %s", path, error.text());
      return is_whole;
    }
    if (::lseek(file.get(), 0, SEEK_SET) != 0 || !ask_status(file, path, status)) return false;
    if (status.st_size > std::max(kLargeFile, first_size)) {
      daemon_log(0, kLoad, "too big for our purposes");
      return false;
    }
  }
}

bool read_at(const Descriptor& file, std::span<std::byte> bytes, off_t offset) noexcept {
  ssize_t count = 0;
  do {
    count = ::pread(file.get(), bytes.data(), bytes.size(), offset);
  } while (count < 0 && errno == EINTR);
  return count == static_cast<ssize_t>(bytes.size());
}

// Spares a huge file that is no property list the memory, and everybody else the wait: its first bytes and its trailer,
// held against its size, tell.
bool has_sound_ends(const Descriptor& file, off_t size) noexcept {
  std::byte header[binary_format::kHeader.size()];
  std::byte trailer[binary_format::kTrailerSize];
  std::uint64_t table = 0;
  return read_at(file, header, 0) && read_at(file, trailer, size - static_cast<off_t>(sizeof trailer)) &&
         detail::BinaryLayout().parse_ends(header, trailer, static_cast<std::uint64_t>(size), table);
}

PropertyValue read_value(const Descriptor& file, const char* path, const struct stat& status, Mutability mutability,
                         CheckedBytes* checked) noexcept {
  ByteBuffer buffer;
  if (!read_steady(file, path, status, buffer)) return {};
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
  if (!ask_status(file, path, status)) return {};
  if (status.st_size > kLargestFile) {
    daemon_log(0, kLoad, "too big for our purposes");
    return {};
  }
  if (status.st_size <= kLargeFile) return read_value(file, path, status, mutability, checked);
  if (!has_sound_ends(file, status.st_size)) {
    daemon_log(0, kLoad, "Could not create dictionary from stream");
    return {};
  }
  const LockHold one_at_a_time(large_load_lock);
  return read_value(file, path, status, mutability, checked);
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
