// Entries of a dictionary that are left out when it is written, so that nobody has to make a copy without them.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstdlib>

#include "property/value.h"

namespace quorvel {

/// A set of entries of one dictionary, which may not change while the set is used. Of one thread.
class OmittedEntries {
 public:
  OmittedEntries() noexcept = default;
  OmittedEntries(const OmittedEntries&) = delete;
  OmittedEntries& operator=(const OmittedEntries&) = delete;
  ~OmittedEntries() { std::free(bits_); }

  /// Adds the entry under `key`, if there is one; `dictionary` must be the same in all calls. False when memory runs
  /// out.
  [[nodiscard]] bool add(const PropertyValue& dictionary, const HashedKey& key) noexcept;

  [[nodiscard]] std::size_t count() const noexcept { return count_; }
  /// Whether an entry at `position` in the dictionary's row is left out. Only when the count is not 0.
  [[nodiscard]] bool contains(std::size_t position) const noexcept {
    return (bits_[position / 64] >> (position % 64) & 1) != 0;
  }

 private:
  std::uint64_t* bits_ = nullptr;  // by position
  std::size_t count_ = 0;
};

}  // namespace quorvel
