#include "property/hash.h"

#include <chrono>

namespace quorvel::detail {

namespace {

std::uint64_t make_seed() noexcept {
  const auto now = static_cast<std::uint64_t>(std::chrono::steady_clock::now().time_since_epoch().count());
  int local = 0;
  return mix(now ^ reinterpret_cast<std::uintptr_t>(&local), reinterpret_cast<std::uintptr_t>(&make_seed) | 1);
}

}  // namespace

const std::uint64_t kHashSeed = make_seed();

}  // namespace quorvel::detail
