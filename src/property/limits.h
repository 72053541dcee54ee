// The bounds that hold alike for reading, writing, comparing, describing and copying values, so that what one
// operation makes another can use.
#pragma once

#include <cstddef>
#include <cstdint>

namespace quorvel {

/// The size in bytes of the largest file that can be read whole, because a read delivers no more.
inline constexpr std::int64_t kLargestFile = 0x7ffff000;

/// How many containers may lie within each other.
inline constexpr std::size_t kMaximumDepth = 512;

/// How many elements may be met again through containers that are referred to more than once. Walking a value visits
/// such containers once for each reference, so a few bytes could otherwise stand for an endless walk.
inline constexpr std::size_t kMaximumRepeatedNodes = 1'000'000;

}  // namespace quorvel
