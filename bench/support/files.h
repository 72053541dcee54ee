// Whole files by the plain system calls, for contenders and limits. Everything throws when a call fails.
#pragma once

#include <sys/types.h>

#include <cstddef>
#include <filesystem>
#include <memory>
#include <span>
#include <string>

#include "platform/descriptor.h"

namespace quorvel::bench {

/// A file, or a directory, open until the end of the scope.
[[nodiscard]] Descriptor open_file(const std::filesystem::path& path, int flags);

void write_whole(int descriptor, std::span<const std::byte> bytes);
void write_file(const std::filesystem::path& path, std::span<const std::byte> bytes);
/// Fills `room` from the file, as far as it goes; returns the number of bytes. One open, one status, one read.
std::size_t read_file(const std::filesystem::path& path, std::span<std::byte> room);
/// Room that is not cleared first, and the file's bytes in it.
struct FileBytes {
  std::unique_ptr<std::byte[]> room;
  std::size_t size = 0;
  [[nodiscard]] std::span<const std::byte> bytes() const { return {room.get(), size}; }
};
[[nodiscard]] FileBytes read_file(const std::filesystem::path& path);

/// Whether the bytes survive a power cut once they have been written.
enum class Flushing { none, durable };
/// Writes to "PATH.new", which then replaces the file.
void replace_file(const std::filesystem::path& path, std::span<const std::byte> bytes, Flushing flushing);

/// Tells one file from the one that replaced it.
[[nodiscard]] ino_t file_number(const std::filesystem::path& path);

}  // namespace quorvel::bench
