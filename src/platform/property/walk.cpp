#include "platform/property/walk.h"

#include <cstdlib>

namespace quorvel {

using namespace detail;

namespace {

// Puts a container into a set with room for it; false when it was there.
bool insert(Word* set, std::size_t size, Word container) noexcept {
  std::size_t at = static_cast<std::size_t>(mix(container, 0x9e3779b97f4a7c15)) & (size - 1);
  for (; set[at] != 0; at = (at + 1) & (size - 1)) {
    if (set[at] == container) return false;
  }
  set[at] = container;
  return true;
}

bool walk(const PropertyValue& value, WalkBudget& budget) noexcept {
  if (!value.is_container()) return true;
  if (!budget.enter(value)) return false;
  bool within = true;
  if (value.is_dictionary()) {
    for (const auto& [key, element] : value.entries()) {
      within = walk(element, budget);
      if (!within) break;
    }
  } else {
    for (std::size_t i = 0; within && i < value.size(); ++i) within = walk(value.at(i), budget);
  }
  budget.leave();
  return within;
}

}  // namespace

WalkBudget::~WalkBudget() {
  if (seen_ != few_) std::free(seen_);
}

bool WalkBudget::grow() noexcept {
  auto* larger = static_cast<Word*>(std::calloc(seen_size_ * 2, sizeof(Word)));
  if (larger == nullptr) return false;
  for (std::size_t i = 0; i < seen_size_; ++i) {
    if (seen_[i] != 0) insert(larger, seen_size_ * 2, seen_[i]);
  }
  if (seen_ != few_) std::free(seen_);
  seen_ = larger;
  seen_size_ *= 2;
  return true;
}

// True when the container is new. One that cannot be remembered counts as repeated: the bound then comes early.
bool WalkBudget::remember(Word container) noexcept {
  if (seen_count_ * 2 >= seen_size_ && !grow()) return false;
  if (!insert(seen_, seen_size_, container)) return false;
  ++seen_count_;
  return true;
}

bool WalkBudget::enter(const PropertyValue& container) noexcept {
  if (depth_ == kMaximumDepth) return false;
  ++depth_;
  const Word word = container.word();
  if (repeated_depth_ > 0) {
    ++repeated_depth_;
  } else if (node_of(word)->count.load(std::memory_order_relaxed) > 1 && !remember(word)) {
    repeated_depth_ = 1;
  }
  if (repeated_depth_ == 0) return true;
  repeated_nodes_ += 1 + container.size() * (container.is_dictionary() ? 2 : 1);
  return repeated_nodes_ <= kMaximumRepeatedNodes;
}

bool is_within_limits(const PropertyValue& value) noexcept {
  WalkBudget budget;
  return walk(value, budget);
}

}  // namespace quorvel
