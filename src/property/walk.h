// Bounds a walk over a value by the limits that hold for every operation: see limits.h.
#pragma once

#include <cstddef>

#include "property/limits.h"
#include "property/value.h"

namespace quorvel {

/// Follows a depth-first walk into containers and back out. A container that is met for a second time counts its
/// elements, and everything below it, against the bound on repeated nodes; what is met once is free. Of one thread.
class WalkBudget {
 public:
  WalkBudget() noexcept = default;
  WalkBudget(const WalkBudget&) = delete;
  WalkBudget& operator=(const WalkBudget&) = delete;
  ~WalkBudget();

  /// Goes into a container. False when that is too deep or repeats too much; the walk must end then.
  [[nodiscard]] bool enter(const PropertyValue& container) noexcept;
  void leave() noexcept {
    --depth_;
    if (repeated_depth_ > 0) --repeated_depth_;
  }

 private:
  [[nodiscard]] bool remember(detail::Word container) noexcept;
  [[nodiscard]] bool grow() noexcept;

  std::size_t depth_ = 0;
  std::size_t repeated_depth_ = 0;  // levels since a repeated container was entered, itself included
  std::size_t repeated_nodes_ = 0;
  detail::Word few_[16] = {};
  detail::Word* seen_ = few_;  // a set with linear probing, of the containers with more than one reference
  std::size_t seen_size_ = 16;
  std::size_t seen_count_ = 0;
};

/// True when a walk over `value` stays within the bounds, with so many containers around it. Any thread.
[[nodiscard]] bool is_within_limits(const PropertyValue& value, std::size_t containers_around = 0) noexcept;

}  // namespace quorvel
