#include "bench/support/files.h"

#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdio>
#include <system_error>

namespace quorvel::bench {
namespace {

void require(bool done, const char* what) {
  if (!done) throw std::system_error(errno, std::generic_category(), what);
}

}  // namespace

Descriptor open_file(const std::filesystem::path& path, int flags) {
  Descriptor file(::open(path.c_str(), flags | O_CLOEXEC, 0644));
  require(static_cast<bool>(file), path.c_str());
  return file;
}

void write_whole(int descriptor, std::span<const std::byte> bytes) {
  require(::write(descriptor, bytes.data(), bytes.size()) == static_cast<ssize_t>(bytes.size()), "write");
}

void write_file(const std::filesystem::path& path, std::span<const std::byte> bytes) {
  write_whole(open_file(path, O_WRONLY | O_CREAT | O_TRUNC).get(), bytes);
}

std::size_t read_file(const std::filesystem::path& path, std::span<std::byte> room) {
  const Descriptor file = open_file(path, O_RDONLY);
  struct stat status {};
  require(::fstat(file.get(), &status) == 0, "fstat");
  const ssize_t count = ::read(file.get(), room.data(), room.size());
  require(count == status.st_size, "read");
  return static_cast<std::size_t>(count);
}

FileBytes read_file(const std::filesystem::path& path) {
  const Descriptor file = open_file(path, O_RDONLY);
  struct stat status {};
  require(::fstat(file.get(), &status) == 0, "fstat");
  FileBytes content;
  content.size = static_cast<std::size_t>(status.st_size);
  content.room = std::make_unique_for_overwrite<std::byte[]>(content.size);
  require(::read(file.get(), content.room.get(), content.size) == status.st_size, "read");
  return content;
}

void replace_file(const std::filesystem::path& path, std::span<const std::byte> bytes, Flushing flushing) {
  std::filesystem::path temporary = path;
  temporary += ".new";
  {
    const Descriptor file = open_file(temporary, O_WRONLY | O_CREAT | O_TRUNC);
    write_whole(file.get(), bytes);
    if (flushing == Flushing::durable) require(::fsync(file.get()) == 0, "fsync");
  }
  require(::rename(temporary.c_str(), path.c_str()) == 0, "rename");
  if (flushing == Flushing::none) return;
  require(::fsync(open_file(path.parent_path(), O_RDONLY | O_DIRECTORY).get()) == 0, "fsync");
}

ino_t file_number(const std::filesystem::path& path) {
  struct stat status {};
  require(::stat(path.c_str(), &status) == 0, "stat");
  return status.st_ino;
}

}  // namespace quorvel::bench
