// The classes of store keys: docs/data-ark.md says what each means.
#pragma once

namespace quorvel {

inline constexpr unsigned kClassCount = 9;

/// A class that the data ark keeps and does not interpret: the key is saved and its changes count.
inline constexpr unsigned kSavedClass = 0;
/// Keys that a save leaves out and whose changes do not count.
inline constexpr unsigned kMemoryOnlyClass = 1;
inline constexpr unsigned kVolatileClass = 7;
/// Keys whose changes by a set do not count, whose removals do, and which are saved.
inline constexpr unsigned kQuietSetClass = 5;

}  // namespace quorvel
