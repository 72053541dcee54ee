// A program under measurement, in a process of its own.
#pragma once

#include <sys/types.h>

#include <chrono>
#include <filesystem>
#include <string>
#include <vector>

#include "platform/descriptor.h"

namespace quorvel::bench {

/// Tells readiness as a service manager is told, so that every program is asked alike. Unlike the tests' Program it is
/// made without copying this process, whose size would be measured with its start.
class Child {
 public:
  /// Starts a program, with nothing on its standard streams, and waits until it reports that it is ready, or, without
  /// `reports`, not at all. Throws when it cannot be started or is not ready within ten seconds.
  explicit Child(const std::vector<std::string>& command, bool reports = true);
  /// Ends the program.
  ~Child();
  Child(const Child&) = delete;
  Child& operator=(const Child&) = delete;

  /// From the start to the report, and the processor time of all its threads until then; in nanoseconds.
  [[nodiscard]] double time_to_ready() const { return time_to_ready_; }
  [[nodiscard]] double processor_time_to_ready() const { return processor_time_to_ready_; }

  struct Memory {
    double resident;      // bytes
    double proportional;  // bytes, with pages that it shares with others counted in parts
  };
  [[nodiscard]] Memory memory() const;

 private:
  void await_report(int socket);

  pid_t pid_ = -1;
  double time_to_ready_ = 0;
  double processor_time_to_ready_ = 0;
};

}  // namespace quorvel::bench
