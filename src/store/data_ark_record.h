// The data ark's record and what the operations on it share. Private to the store.
#pragma once

#include <array>
#include <cstdint>

#include "platform/lock.h"
#include "property/value.h"
#include "store/key_class.h"
#include "store/store_key.h"

namespace quorvel {

[[nodiscard]] constexpr unsigned class_bit(unsigned key_class) noexcept { return 1u << key_class; }
inline constexpr unsigned kAllClasses = (1u << kClassCount) - 1;

/// Keys that a save leaves out and whose changes do not count; keys whose changes by a set do not count.
inline constexpr unsigned kUnsaved = class_bit(kMemoryOnlyClass) | class_bit(kVolatileClass);
inline constexpr unsigned kUncountedSet = kUnsaved | class_bit(kQuietSetClass);

/// The registries in the order they are kept: set, changed, removed.
enum Registry : unsigned { kOnSet, kOnChanged, kOnRemoved, kRegistryCount };

class DataArk {
 public:
  Lock lock;
  std::uint32_t change_count QUORVEL_GUARDED_BY(lock) = 0;
  // A dictionary from store key to value; none until the file is loaded or the first value is set.
  PropertyValue values QUORVEL_GUARDED_BY(lock);
  // The nine key classes: a dictionary from store key to a mask of the classes it belongs to, so that one look-up
  // answers for all of them; none until the first mark. Shares the texts of its keys with `values`.
  PropertyValue class_marks QUORVEL_GUARDED_BY(lock);
  // Dictionaries from store key to notification name; none until their first registration.
  std::array<PropertyValue, kRegistryCount> registries QUORVEL_GUARDED_BY(lock);
  // The data file was there at the load but could not be used: it may hold what must not be lost.
  bool file_is_unreadable QUORVEL_GUARDED_BY(lock) = false;

  /// The classes that a store key belongs to, as a mask of `class_bit`s.
  [[nodiscard]] unsigned classes_of(const HashedKey& key) const noexcept QUORVEL_REQUIRES(lock) {
    return classes_in(class_marks.get(key));
  }
  /// The classes that a value of `class_marks` tells.
  [[nodiscard]] static unsigned classes_in(const PropertyValue& marks) noexcept {
    return static_cast<unsigned>(marks.to_int64().value_or(0));
  }
  /// Marks a store key with classes it does not belong to yet. False when memory runs out.
  [[nodiscard]] bool add_to_classes(const HashedKey& key, unsigned classes) noexcept QUORVEL_REQUIRES(lock);
  /// Takes marks away from a store key.
  void remove_from_classes(const HashedKey& key, unsigned classes) noexcept QUORVEL_REQUIRES(lock);
  /// Posts the name that is registered for an event under a store key, if there is one.
  void post(Registry event, const HashedKey& key) const noexcept QUORVEL_REQUIRES(lock);
};

}  // namespace quorvel
