#include "live_answer.h"

#include "platform/device_information.h"
#include "store/live_answers.h"

namespace quorvel::tools {

LiveAnswer live_answer(const std::string& domain, bool has_domain, const std::string& key) {
  const larry_info* row =
      find_live_answer(has_domain ? PropertyValue::string(domain) : PropertyValue(), PropertyValue::string(key));
  return row == nullptr ? LiveAnswer() : live_answer(*row);
}

LiveAnswer live_answer(const larry_info& row) { return {&row, platform::copy_device_answer(row.question), "", ""}; }

}  // namespace quorvel::tools
