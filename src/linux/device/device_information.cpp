#include "platform/device_information.h"

#include <algorithm>
#include <utility>

#include "linux/base/small_file.h"
#include "linux/device/source_table.h"
#include "platform/device_paths.h"

namespace quorvel::platform {

// Packaging knows the device better than the kernel does, so its file is asked first, whatever the question.
DeviceAnswer copy_device_answer_with_origin(std::string_view question) noexcept {
  static constinit std::atomic<bool> told = false;
  if (PropertyValue answer = host::read_file_entry(paths::kDeviceInformation, question, told)) {
    return {std::move(answer), PropertyValue::string(paths::kDeviceInformation)};
  }
  const auto* row =
      std::ranges::find_if(host::kQuestionSources, [question](const auto& one) { return one.question == question; });
  if (row == std::end(host::kQuestionSources)) return {};
  for (const host::Source source : row->sources) {
    if (source == nullptr) break;
    if (DeviceAnswer answer = source(); answer.value) return answer;
  }
  return {};
}

}  // namespace quorvel::platform
