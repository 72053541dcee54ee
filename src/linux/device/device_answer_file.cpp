#include "linux/base/small_file.h"
#include "linux/device/device_sources.h"

namespace quorvel::platform::host {

PropertyValue answer_from_file(std::string_view question) noexcept {
  return read_file_entry("/etc/quorvel/device_information.plist", question);
}

}  // namespace quorvel::platform::host
