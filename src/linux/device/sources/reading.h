// How sources read: paths put together, small files, directories. Nothing here waits for a FIFO or retries a failed
// read: one file that cannot be read is one fact that is missing.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "linux/device/sources/parsing.h"
#include "platform/device_information.h"
#include "property/byte_buffer.h"

namespace quorvel::platform::host {

/// A path put together from components; empty, and so nowhere, when it grows too long.
class SourcePath {
 public:
  template <typename... Components>
  explicit SourcePath(std::string_view first, Components... components) noexcept {
    append(first);
    (add(components), ...);
  }
  [[nodiscard]] const char* text() const noexcept { return text_; }

 private:
  void add(std::string_view component) noexcept {
    append("/");
    append(component);
  }
  void append(std::string_view part) noexcept;

  char text_[1024] = {};
  std::size_t length_ = 0;
  bool is_too_long_ = false;
};

/// A file's content, at most 64 KiB; empty when it cannot be read. Links are followed inside the device root.
class SourceFile {
 public:
  explicit SourceFile(const char* path) noexcept;
  explicit SourceFile(const SourcePath& path) noexcept : SourceFile(path.text()) {}
  [[nodiscard]] std::string_view content() const noexcept {
    return {reinterpret_cast<const char*>(content_.data()), content_.size()};
  }
  [[nodiscard]] std::string_view text() const noexcept { return first_text(content()); }
  [[nodiscard]] std::optional<std::int64_t> integer() const noexcept { return parse_integer(text()); }

 private:
  ByteBuffer content_;
};

/// True when anything stands at the path, a link that leads nowhere included.
[[nodiscard]] bool something_stands_at(const SourcePath& path) noexcept;

/// The path of an object with every link resolved, or of a link that leads nowhere what it says; empty when there is
/// neither. A view into `buffer`.
[[nodiscard]] std::string_view target_path(const SourcePath& path, char (&buffer)[1024]) noexcept;

/// An answer of a text that came from a file, or none when the text is empty.
[[nodiscard]] DeviceAnswer text_answer(std::string_view text, const char* origin) noexcept;
/// An answer with its origin, or none.
[[nodiscard]] DeviceAnswer answer_from(PropertyValue value, const char* origin) noexcept;
/// The text of a file that firmware filled, unless it is a placeholder.
[[nodiscard]] DeviceAnswer firmware_text(const SourcePath& path) noexcept;
/// The same for a serial number, which has at least three characters.
[[nodiscard]] DeviceAnswer firmware_serial(const SourcePath& path) noexcept;

}  // namespace quorvel::platform::host
