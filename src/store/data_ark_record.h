// The data ark's record and what the operations on it share. Private to the store.
#pragma once

#include <array>
#include <cstdint>

#include "platform/lock.h"
#include "platform/property/value.h"
#include "store/store_key.h"

namespace quorvel {

inline constexpr unsigned kClassCount = 9;
/// Classes that the store itself interprets: neither saved nor counted, and uncounted when set.
inline constexpr unsigned kMemoryOnlyClass = 1;
inline constexpr unsigned kQuietSetClass = 5;
inline constexpr unsigned kVolatileClass = 7;

/// The registries in the order they are kept: set, changed, removed.
enum Registry : unsigned { kOnSet, kOnChanged, kOnRemoved, kRegistryCount };

class DataArk {
 public:
  Lock lock;
  std::uint32_t change_count QUORVEL_GUARDED_BY(lock) = 0;
  // A dictionary from store key to value; none until the file is loaded or the first value is set.
  PropertyValue values QUORVEL_GUARDED_BY(lock);
  // Dictionaries used as sets of store keys; none until their first member.
  std::array<PropertyValue, kClassCount> classes QUORVEL_GUARDED_BY(lock);
  // Dictionaries from store key to notification name; none until their first registration.
  std::array<PropertyValue, kRegistryCount> registries QUORVEL_GUARDED_BY(lock);
  // The data file was there at the load but could not be used: it may hold what must not be lost.
  bool file_is_unreadable QUORVEL_GUARDED_BY(lock) = false;

  [[nodiscard]] bool is_in_class(const HashedKey& key, unsigned key_class) const noexcept QUORVEL_REQUIRES(lock) {
    return key_class < kClassCount && classes[key_class].size() > 0 && classes[key_class].get(key);
  }
  /// True for the keys that a save leaves out and whose changes do not count.
  [[nodiscard]] bool is_unsaved(const HashedKey& key) const noexcept QUORVEL_REQUIRES(lock) {
    return is_in_class(key, kMemoryOnlyClass) || is_in_class(key, kVolatileClass);
  }
  /// False when memory runs out.
  [[nodiscard]] bool add_to_class(const HashedKey& key, unsigned key_class) noexcept QUORVEL_REQUIRES(lock);
  /// Posts the name that is registered for an event under a store key, if there is one.
  void post(Registry event, const HashedKey& key) const noexcept QUORVEL_REQUIRES(lock);
};

}  // namespace quorvel
