#include "property/hash.h"

#include <ctime>

namespace quorvel::detail {

namespace {

std::uint64_t make_seed() noexcept {
  timespec time{};  // of the C library: the C interface builds on nothing else
  std::timespec_get(&time, TIME_UTC);
  const auto now = static_cast<std::uint64_t>(time.tv_nsec ^ time.tv_sec << 30);
  int local = 0;
  return mix(now ^ reinterpret_cast<std::uintptr_t>(&local), reinterpret_cast<std::uintptr_t>(&make_seed) | 1);
}

}  // namespace

const std::uint64_t kHashSeed = make_seed();

}  // namespace quorvel::detail
