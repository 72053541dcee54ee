#include "support/watching.h"

namespace quorvel::test {

bool eventually(const std::function<bool()>& condition, std::chrono::milliseconds patience) {
  const auto deadline = std::chrono::steady_clock::now() + patience;
  while (!condition()) {
    if (std::chrono::steady_clock::now() > deadline) return false;
    std::this_thread::sleep_for(std::chrono::milliseconds(3));
  }
  return true;
}

std::size_t descriptors_open(pid_t pid) {
  const std::filesystem::directory_iterator entries("/proc/" + std::to_string(pid) + "/fd");
  const auto count = static_cast<std::size_t>(std::distance(begin(entries), end(entries)));
  return pid == ::getpid() ? count - 1 : count;  // not the one that listed them
}

std::size_t descriptors_open() { return descriptors_open(::getpid()); }

}  // namespace quorvel::test
