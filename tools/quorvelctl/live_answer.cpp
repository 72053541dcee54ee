#include "live_answer.h"

#include "platform/device_information.h"
#include "store/live_answers.h"

namespace quorvel::tools {

LiveAnswer live_answer(const std::string& domain, bool has_domain, const std::string& key) {
  constexpr int kQuestion = 0;
  const PropertyValue question =
      larry_lookup(has_domain ? PropertyValue::string(domain) : PropertyValue(), PropertyValue::string(key), kQuestion);
  if (!question) return {};
  return {true, platform::copy_device_answer(question.text())};
}

}  // namespace quorvel::tools
