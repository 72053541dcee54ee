#pragma once

#include <sys/types.h>

#include <cstddef>

namespace quorvel::test {

/// How many descriptors this process, or process `pid`, has open.
[[nodiscard]] std::size_t descriptors_open();
[[nodiscard]] std::size_t descriptors_open(pid_t pid);

}  // namespace quorvel::test
