#include "property/walk.h"

#include <algorithm>
#include <cstdint>
#include <cstdlib>

namespace quorvel {

using namespace detail;

namespace {

// The size of a walk over one container: the nodes of all visits, and how many containers lie within each other.
struct Extent {
  Word container;  // 0 in a free slot
  std::uint64_t nodes;
  std::size_t height;
};

// Works out the extent of a value from those of its parts. A container with several holders is looked into once, so
// that this takes no longer than the value has references, whatever they fan out to.
class Measure {
 public:
  Measure() noexcept = default;
  Measure(const Measure&) = delete;
  Measure& operator=(const Measure&) = delete;
  ~Measure() {
    if (known_ != few_) std::free(known_);
  }

  /// Goes into a container `depth` levels down and adds its extent to that of the container around it. False when it
  /// is too deep, or memory runs out.
  [[nodiscard]] bool add(const PropertyValue& container, std::size_t depth, Extent& around) noexcept;
  /// How many nodes there are without repetition.
  [[nodiscard]] std::uint64_t distinct() const noexcept { return distinct_; }

 private:
  // More than any value can have without repetition, far below an overflow.
  static constexpr std::uint64_t kEndless = std::uint64_t{1} << 48;

  [[nodiscard]] bool add_elements(const PropertyValue& container, std::size_t depth, Extent& extent) noexcept;
  [[nodiscard]] Extent& slot(Extent* known, std::size_t size, Word container) const noexcept {
    std::size_t at = static_cast<std::size_t>(mix(container, 0x9e3779b97f4a7c15)) & (size - 1);
    while (known[at].container != 0 && known[at].container != container) at = (at + 1) & (size - 1);
    return known[at];
  }
  [[nodiscard]] bool remember(const Extent& extent) noexcept;

  std::uint64_t distinct_ = 0;
  Extent few_[16] = {};
  Extent* known_ = few_;
  std::size_t size_ = 16;
  std::size_t count_ = 0;
};

bool Measure::remember(const Extent& extent) noexcept {
  if (count_ * 2 >= size_) {
    auto* larger = static_cast<Extent*>(std::calloc(size_ * 2, sizeof(Extent)));
    if (larger == nullptr) return false;
    for (std::size_t i = 0; i < size_; ++i) {
      if (known_[i].container != 0) slot(larger, size_ * 2, known_[i].container) = known_[i];
    }
    if (known_ != few_) std::free(known_);
    known_ = larger;
    size_ *= 2;
  }
  slot(known_, size_, extent.container) = extent;
  ++count_;
  return true;
}

bool Measure::add_elements(const PropertyValue& container, std::size_t depth, Extent& extent) noexcept {
  if (container.is_dictionary()) {
    for (const auto& [key, element] : container.entries()) {
      if (element.is_container() && !add(element, depth + 1, extent)) return false;
    }
    return true;
  }
  for (std::size_t i = 0; i < container.size(); ++i) {
    if (container.at(i).is_container() && !add(container.at(i), depth + 1, extent)) return false;
  }
  return true;
}

bool Measure::add(const PropertyValue& container, std::size_t depth, Extent& around) noexcept {
  if (depth > kMaximumDepth) return false;
  const bool is_shared = node_of(container.word())->count.load(std::memory_order_relaxed) > 1;
  Extent extent = is_shared ? slot(known_, size_, container.word()) : Extent{};
  if (extent.container == 0) {
    extent = {container.word(), 1 + container.size() * (container.is_dictionary() ? 2 : 1), 1};
    distinct_ += extent.nodes;
    if (!add_elements(container, depth, extent) || (is_shared && !remember(extent))) return false;
  }
  around.nodes = std::min(around.nodes + extent.nodes, kEndless);
  around.height = std::max(around.height, extent.height + 1);
  return depth + extent.height - 1 <= kMaximumDepth;
}

bool holds_a_container(const PropertyValue& value) noexcept {
  if (value.is_dictionary()) {
    for (const auto& [key, element] : value.entries()) {
      if (element.is_container()) return true;
    }
    return false;
  }
  for (std::size_t i = 0; i < value.size(); ++i) {
    if (value.at(i).is_container()) return true;
  }
  return false;
}

}  // namespace

bool is_within_limits(const PropertyValue& value, std::size_t containers_around) noexcept {
  if (!value.is_container()) return true;
  // Most containers that are stored hold leaves alone: those repeat nothing, and need no measure set up.
  if (!holds_a_container(value)) return containers_around < kMaximumDepth;
  Measure measure;
  Extent whole = {};
  return measure.add(value, 1 + containers_around, whole) && whole.nodes - measure.distinct() <= kMaximumRepeatedNodes;
}

}  // namespace quorvel
