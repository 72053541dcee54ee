// The programs whose start and memory are compared.
#pragma once

#include <cstddef>
#include <memory>
#include <string>
#include <vector>

namespace quorvel::bench {

class StartedProgram {
 public:
  virtual ~StartedProgram() = default;
  [[nodiscard]] virtual std::string name() const = 0;
  [[nodiscard]] virtual std::size_t entries() const = 0;
  /// Puts everything as it is before a start.
  virtual void prepare() {}
  [[nodiscard]] virtual std::vector<std::string> command() const = 0;
};

/// The daemon with 100, 10,000 and 100,000 entries, and the contenders that are installed: dbus-daemon, which holds no
/// data, and redis-server with as many entries.
[[nodiscard]] std::vector<std::unique_ptr<StartedProgram>> make_programs();

}  // namespace quorvel::bench
