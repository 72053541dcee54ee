#include "recording.h"

#include <algorithm>
#include <cerrno>
#include <cstring>
#include <fstream>
#include <limits>

#include "failure.h"
#include "json.h"
#include "wire/telephony_state.h"

namespace quorvel::tools {
namespace {

// Why a line is no step, or an empty text.
std::string take_step(const std::string& line, RecordedStep& step) {
  const ParsedJson parsed = parse_json(line);
  if (parsed.error) return *parsed.error;
  const PropertyValue& time = parsed.value.get(kRecordTime);
  const PropertyValue& event = parsed.value.get(kRecordEvent);
  step.state = parsed.value.get(kRecordState);
  if (time.kind() != PropertyKind::date) return "\"time\" is no date";
  if (!step.state.is_dictionary()) return "\"state\" is no dictionary";
  if (event && !wire::is_telephony_notification(event.text()))
    return "\"event\" is no notification of a telephony service";
  step.event = event.text();
  // A clock that was set back while recording does not hold up what follows.
  step.time = std::max(step.time, time.to_double());
  return {};
}

}  // namespace

std::vector<RecordedStep> read_recording(const std::string& path, int status) {
  std::ifstream file(path);
  if (!file) throw Failure{status, "cannot read " + path + ": " + std::strerror(errno)};
  std::vector<RecordedStep> steps;
  RecordedStep step{std::numeric_limits<double>::lowest(), {}, {}};
  std::size_t number = 0;
  for (std::string line; std::getline(file, line);) {
    ++number;
    if (line.empty()) continue;
    if (const std::string refusal = take_step(line, step); !refusal.empty()) {
      throw Failure{status, std::string(path).append(", line ").append(std::to_string(number)).append(": ") + refusal};
    }
    steps.push_back(step);
  }
  if (steps.empty()) throw Failure{status, path + " holds no recording. Make one with: quorvelctl sim record FILE"};
  return steps;
}

}  // namespace quorvel::tools
