// How a command of these tools ends when it cannot do what it was asked.
#pragma once

#include <string>
#include <string_view>
#include <utility>

#include "property/value.h"

namespace quorvel::tools {

enum ExitStatus : int {
  kDone = 0,
  kNoValue = 1,      // there is no such value
  kWrongWords = 2,   // the words of the call are off
  kUnreachable = 3,  // a service or file cannot be reached or read
};

/// Thrown by a command; main prints the message, which says what to do next, and ends with the status.
struct Failure {
  int status;
  std::string message;
};

[[noreturn]] inline void fail_for_memory() { throw Failure{kUnreachable, "memory does not suffice"}; }

/// Sets an entry of a dictionary; throws Failure when memory runs out.
inline void put(PropertyValue& dictionary, std::string_view key, const PropertyValue& value) {
  if (!dictionary.set(key, value)) fail_for_memory();
}

}  // namespace quorvel::tools
