// The daemon's log: two files that are read as one text, through rotations.
#pragma once

#include <string>

#include "platform/descriptor.h"

namespace quorvel::tools {

class LogFiles {
 public:
  /// Opens both generations. False when there is no log at all; throws Failure when there is one that cannot be read.
  [[nodiscard]] bool open();

  /// The next bytes in the order they were written; empty when there are none at the moment. Follows rotations.
  [[nodiscard]] std::string read();

 private:
  void move_on();

  Descriptor current_;    // being read
  Descriptor following_;  // to be read when `current_` is at its end
};

}  // namespace quorvel::tools
