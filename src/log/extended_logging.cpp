#include "log/extended_logging.h"

#include "log/daemon_log.h"
#include "platform/device_information.h"
#include "platform/device_questions.h"
#include "platform/preferences.h"

namespace quorvel {

int extended_logging = 1;

void setup_extended_logging() noexcept {
  if (platform::copy_device_answer(platform::QuestionName("ReleaseType")).text() == "Internal") {
    extended_logging = 1;
    return;
  }
  // That the preference is there turns detail lines on; its number says nothing.
  extended_logging = platform::has_integer_preference("ExtLogging", "com.Orvane.quorveld") ? 1 : 0;
}

}  // namespace quorvel
