#include "live_answer.h"

#include "files.h"
#include "platform/device_information.h"
#include "platform/device_paths.h"
#include "platform/device_questions.h"
#include "store/live_answers.h"
#include "telephony_look.h"

namespace quorvel::tools {
namespace {

// Packaging may answer with a value of another kind, which has no unit.
std::string_view unit_of(const PropertyValue& value, std::string_view name) {
  const platform::DeviceQuestion* question = platform::find_device_question(name);
  return question != nullptr && question->kind == value.kind() ? question->unit : std::string_view();
}

}  // namespace

LiveAnswer live_answer(const std::string& domain, bool has_domain, const std::string& key) {
  const larry_info* row =
      find_live_answer(has_domain ? PropertyValue::string(domain) : PropertyValue(), PropertyValue::string(key));
  if (row == nullptr) return {};
  // The file is asked before the machine: one that is there and cannot be used is told of instead of the machine's
  // word.
  static_cast<void>(read_device_plist(paths::kDeviceInformation));
  look_at_telephony();
  return live_answer(*row);
}

LiveAnswer live_answer(const larry_info& row) {
  const platform::DeviceAnswer answer = platform::copy_device_answer_with_origin(row.question);
  return {&row, answer.value, std::string(answer.origin.text()), unit_of(answer.value, row.question)};
}

}  // namespace quorvel::tools
