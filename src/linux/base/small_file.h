// Files that provisioning and the kernel keep for the daemon, read whole. Anything but a regular
// file is refused, and never waited for.
#pragma once

#include <fcntl.h>

#include <cstddef>

#include "platform/descriptor.h"
#include "property/byte_buffer.h"
#include "property/value.h"

namespace quorvel::platform::host {

/// The flags to open such a file with.
inline constexpr int kSmallFileFlags = O_RDONLY | O_NONBLOCK | O_NOCTTY | O_CLOEXEC;

/// Reads the rest of an open file into `out`. False when it is no regular file, is longer than `maximum`, cannot be
/// read, or memory runs out. Any thread.
[[nodiscard]] bool read_small_file(const Descriptor& file, std::size_t maximum, ByteBuffer& out) noexcept;

/// The value under `key` of the dictionary in the property-list file at `path` in the device root, or none. Any thread.
[[nodiscard]] PropertyValue read_file_entry(const char* path, std::string_view key) noexcept;

}  // namespace quorvel::platform::host
