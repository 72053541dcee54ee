#include "platform/device_information.h"

#include "linux/device/device_sources.h"
#include "platform/device_paths.h"

namespace quorvel::platform {

DeviceAnswer copy_device_answer_with_origin(std::string_view question) noexcept {
  PropertyValue answer = host::answer_from_file(question);
  if (!answer) return {};
  return {std::move(answer), PropertyValue::string(paths::kDeviceInformation)};
}

}  // namespace quorvel::platform
