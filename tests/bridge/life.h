// The life of a modem as daemons see it: what is written down of it in tests/bridge/life, and devices that live it.
#pragma once

#include "support/program.h"
#include "support/scratch_root.h"

namespace quorvel::test {

/// What a daemon does in a step: the lines that it logs, and how often it announces that the number may have changed.
struct Traces {
  std::vector<std::string> lines;
  int posted = 0;
  bool operator==(const Traces&) const = default;
};

struct Step {
  std::string name;
  Traces older, newer;  // with the older kind of baseband, and with the newer one
};

/// The steps in tests/bridge/life/log.
[[nodiscard]] std::vector<Step> written_life();
/// A step as it is written there.
[[nodiscard]] std::string text_of(const Step& step);

inline const std::string kRecording = QUORVEL_LIFE "/recording.jsonl";
/// The lines of a recording, each up to its time.
[[nodiscard]] std::vector<std::string> steps_recorded(const std::string& path);

/// A device with a telephony service, a daemon and someone who hears what it announces.
class Device {
 public:
  enum class Baseband : char { older = 1, newer = 2 };
  explicit Device(Baseband baseband);

  void serve(const std::string& program, std::vector<std::string> arguments = {});
  void start_daemon();
  /// What has happened since the last call, once it is as much as `expected`, or time is over.
  [[nodiscard]] Traces traces(const Traces& expected);

  ScratchRoot root;
  std::optional<Program> service, daemon, monitor;

 private:
  [[nodiscard]] std::vector<std::pair<std::string, std::string>> environment() const;
  [[nodiscard]] int posted() const;

  Traces seen_;
  int posted_before_ = 0;
};

}  // namespace quorvel::test
