#include "support/descriptors.h"

#include <unistd.h>

#include <filesystem>
#include <iterator>
#include <string>

namespace quorvel::test {

std::size_t descriptors_open(pid_t pid) {
  const std::filesystem::directory_iterator entries("/proc/" + std::to_string(pid) + "/fd");
  const auto count = static_cast<std::size_t>(std::distance(begin(entries), end(entries)));
  return pid == ::getpid() ? count - 1 : count;  // not the one that listed them
}

std::size_t descriptors_open() { return descriptors_open(::getpid()); }

}  // namespace quorvel::test
