#include "linux/device/sources/reading.h"

#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <utility>

#include "linux/base/small_file.h"
#include "platform/file_system.h"

namespace quorvel::platform::host {

namespace {

constexpr std::size_t kMaximumFile = 64u << 10;
constexpr std::size_t kShortestSerial = 3;

}  // namespace

void SourcePath::append(std::string_view part) noexcept {
  if (part.size() >= sizeof text_ - length_) is_too_long_ = true;
  if (is_too_long_) {
    text_[0] = '\0';
    return;
  }
  std::memcpy(text_ + length_, part.data(), part.size());
  length_ += part.size();
}

SourceFile::SourceFile(const char* path) noexcept {
  const Descriptor file(open_file(path, kSmallFileFlags, 0));
  if (file && !read_small_file(file, kMaximumFile, content_)) content_.clear();
}

bool something_stands_at(const SourcePath& path) noexcept {
  return static_cast<bool>(Descriptor(open_file(path.text(), O_PATH | O_NOFOLLOW, 0)));
}

std::string_view target_path(const SourcePath& path, char (&buffer)[1024]) noexcept {
  const Descriptor object(open_file(path.text(), O_PATH, 0));
  if (object) return descriptor_path(object.get(), buffer, sizeof buffer) == 0 ? buffer : std::string_view{};
  const Descriptor link(open_file(path.text(), O_PATH | O_NOFOLLOW, 0));
  const ssize_t length = link ? ::readlinkat(link.get(), "", buffer, sizeof buffer - 1) : -1;
  buffer[std::max<ssize_t>(length, 0)] = '\0';
  return buffer;
}

DeviceAnswer text_answer(std::string_view text, const char* origin) noexcept {
  return text.empty() ? DeviceAnswer{} : answer_from(PropertyValue::string(text), origin);
}

DeviceAnswer answer_from(PropertyValue value, const char* origin) noexcept {
  if (!value) return {};
  return {std::move(value), PropertyValue::string(origin)};
}

DeviceAnswer firmware_text(const SourcePath& path) noexcept {
  const SourceFile file(path);
  return is_junk(file.text()) ? DeviceAnswer{} : text_answer(file.text(), path.text());
}

DeviceAnswer firmware_serial(const SourcePath& path) noexcept {
  const SourceFile file(path);
  const bool is_serial = file.text().size() >= kShortestSerial && !is_junk(file.text());
  return is_serial ? text_answer(file.text(), path.text()) : DeviceAnswer{};
}

}  // namespace quorvel::platform::host
