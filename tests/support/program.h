// The built programs, run as a user would run them. They inherit this process's environment, QUORVEL_ROOT included.
#pragma once

#include "platform/descriptor.h"
#include "support/watching.h"

namespace quorvel::test {

/// Where the programs were built. Each throws in a build without the program.
[[nodiscard]] std::string daemon_program();
[[nodiscard]] std::string simulator_program();
[[nodiscard]] std::string control_program();
/// Empty in a build without it, which packagers may choose.
[[nodiscard]] std::string bridge_program();

struct Outcome {
  int status = -1;  ///< the exit status, or 128 and the number of the signal that ended the program
  std::string out;
  std::string err;
};

struct ProgramOptions {
  std::vector<std::string> arguments = {};
  std::string input;                                                  ///< what the program finds on its standard input
  std::vector<std::pair<std::string, std::string>> environment = {};  ///< set on top of this process's
};

/// A program that was started. Its output is kept aside, so it never blocks for want of a reader. It does not outlive
/// the object, nor the thread that started it.
class Program {
 public:
  explicit Program(const std::string& path, const ProgramOptions& options = {});
  /// Kills the program if it still runs.
  ~Program();

  /// Waits until the program reports that it is ready; false when it ends before, or is not ready within `patience`.
  [[nodiscard]] bool wait_until_ready(std::chrono::milliseconds patience = kPatience);
  /// Waits until `text` has appeared on standard output.
  [[nodiscard]] bool wait_for_output(std::string_view text, std::chrono::milliseconds patience = kPatience) const;
  [[nodiscard]] bool running() const;
  [[nodiscard]] pid_t pid() const { return pid_; }
  /// What the program has printed so far.
  [[nodiscard]] std::string out() const;
  [[nodiscard]] std::string err() const;

  void send_signal(int signal) const;
  /// Waits for the program's end. One that has not ended within `patience` is killed and fails the test.
  Outcome wait(std::chrono::milliseconds patience = kPatience);
  /// SIGTERM, then `wait`.
  Outcome stop();

 private:
  std::string path_;
  std::string notify_path_;
  Descriptor notify_;
  Descriptor out_;
  Descriptor err_;
  Descriptor exit_;
  pid_t pid_ = -1;
  bool waited_for_ = false;
};

/// Starts a program that answers and ends, and waits for its end.
[[nodiscard]] Outcome run_to_end(const std::string& path, const std::vector<std::string>& arguments,
                                 const std::string& input = {});

}  // namespace quorvel::test
