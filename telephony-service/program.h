// Everything around the socket that programs which serve it have in common: words, signals, exit statuses.
#pragma once

#include <memory>
#include <string>

#include "common/command_line.h"
#include "linux/base/local_socket.h"
#include "platform/descriptor.h"

namespace quorvel::telephony {

/// Exit statuses, as sysexits.h has them.
inline constexpr int kUsage = 64;
inline constexpr int kNoInput = 66;
inline constexpr int kServiceUnavailable = 69;
inline constexpr int kSystemError = 71;
inline constexpr int kConfiguration = 78;

/// The words of a call. Every such program takes --root, --version and --help.
class CallWords {
 public:
  explicit CallWords(const tools::CommandWords& words);
  ~CallWords();

  /// For the program's own options.
  [[nodiscard]] CLI::App& app() noexcept { return *app_; }
  /// Takes the words of a call, and the device root that they name for everything that follows. False when the call
  /// asked for a text alone, which is printed then. Throws tools::Failure.
  [[nodiscard]] bool take(int count, char** words);

 private:
  std::unique_ptr<CLI::App> app_;
  std::string root_;
};

/// Readable when SIGTERM or SIGINT has come, which do nothing else from now on. Throws tools::Failure.
[[nodiscard]] Descriptor open_end_signals();

/// The listener of the telephony socket. Throws tools::Failure, with a status of its own where another service is
/// running.
[[nodiscard]] platform::host::ListeningSocket claim_listener();

/// One line on standard error, under the program's name.
void print_line(const std::string& program, const std::string& text);

/// Runs a program: its exit status, or that of what it throws, which becomes a line on standard error.
[[nodiscard]] int run_program(const std::string& program, int (*run)(int count, char** words), int count, char** words);

}  // namespace quorvel::telephony
