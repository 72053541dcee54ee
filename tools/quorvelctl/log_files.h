// The daemon's log: two files that are read as one text, through rotations and cuts.
#pragma once

#include <string>

#include "platform/descriptor.h"

namespace quorvel::tools {

class LogFiles {
 public:
  /// Opens both generations. False when there is no log at all; throws Failure when there is one that cannot be read.
  [[nodiscard]] bool open();

  /// The next bytes in the order they were written; empty when there are none at the moment. Follows rotations, and
  /// reads a file that was cut or written anew in place from its start; a line that this leaves unfinished is ended.
  [[nodiscard]] std::string read();

 private:
  // A file that is being read, and what was read of it last.
  struct Reading {
    Descriptor file;
    off_t offset = 0;
    std::string last;

    [[nodiscard]] bool was_written_anew() const;
    [[nodiscard]] std::string read();
  };

  void move_on();

  Reading current_;
  Descriptor following_;  // to be read when `current_` is at its end
  Descriptor finished_;   // was read before `current_`
  bool line_is_open_ = false;
};

}  // namespace quorvel::tools
