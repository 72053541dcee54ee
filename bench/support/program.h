// What the benchmark programs' main functions share.
#pragma once

#include <exception>
#include <iostream>

namespace quorvel::bench {

/// The exit status of `run`, or 1 with a line under the program's name for what it throws.
inline int run_program(const char* name, int (*run)(int argc, char** argv), int argc, char** argv) {
  try {
    return run(argc, argv);
  } catch (const std::exception& error) {
    std::cerr << name << ": " << error.what() << '\n';
    return 1;
  }
}

}  // namespace quorvel::bench
