// Files that provisioning and the kernel keep for the daemon, read whole. Anything but a regular
// file is refused, and never waited for.
#pragma once

#include <fcntl.h>

#include <atomic>
#include <cstddef>

#include "platform/descriptor.h"
#include "property/byte_buffer.h"
#include "property/value.h"

namespace quorvel::platform::host {

/// The flags to open such a file with.
inline constexpr int kSmallFileFlags = O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC;

/// What becomes of a file that is longer than the reader wants.
enum class LongFile { refused, cut };

/// Reads the rest of an open file into `out`, or `maximum` bytes of one that is longer and cut. False when it is no
/// regular file, is longer than `maximum` and refused, cannot be read, or memory runs out. Any thread.
[[nodiscard]] bool read_small_file(const Descriptor& file, std::size_t maximum, ByteBuffer& out,
                                   LongFile long_file = LongFile::refused) noexcept;

/// The value under `key` of the dictionary in the property-list file at `path` in the device root, or none. A file that
/// is there and cannot be used is told of on standard error, once until it has been usable or absent; `told` remembers
/// that for this file. Any thread.
[[nodiscard]] PropertyValue read_file_entry(const char* path, std::string_view key, std::atomic<bool>& told) noexcept;

}  // namespace quorvel::platform::host
