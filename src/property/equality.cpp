#include <cstring>

#include "property/walk.h"

namespace quorvel {

using namespace detail;

namespace {

// One comparison of two values. It counts its depth, and asks once whether the left value repeats more than the limits
// allow: when it first meets a container below the root that several refer to. Without one nothing can be repeated.
class Comparison {
 public:
  explicit Comparison(const PropertyValue& root) noexcept : root_(root) {}

  [[nodiscard]] bool equal(const PropertyValue& left, const PropertyValue& right) noexcept;

 private:
  [[nodiscard]] bool may_enter(const PropertyValue& container) noexcept {
    if (depth_ == kMaximumDepth) return false;
    if (is_measured_ || depth_ == 0 || node_of(container.word())->count.load(std::memory_order_relaxed) == 1)
      return true;
    is_measured_ = true;
    return is_within_limits(root_);
  }
  [[nodiscard]] bool equal_arrays(const PropertyValue& left, const PropertyValue& right) noexcept;
  [[nodiscard]] bool equal_dictionaries(const PropertyValue& left, const PropertyValue& right) noexcept;

  const PropertyValue& root_;
  std::size_t depth_ = 0;
  bool is_measured_ = false;
};

bool equal_leaves(const PropertyValue& left, const PropertyValue& right) noexcept {
  return is_node(left.word()) && is_node(right.word()) && text_of(left.word()) == text_of(right.word());
}

bool Comparison::equal_arrays(const PropertyValue& left, const PropertyValue& right) noexcept {
  for (std::size_t i = 0; i < left.size(); ++i) {
    if (!equal(left.at(i), right.at(i))) return false;
  }
  return true;
}

bool Comparison::equal_dictionaries(const PropertyValue& left, const PropertyValue& right) noexcept {
  for (const auto& [key, value] : left.entries()) {
    const PropertyValue& other = right.get(key.text());
    if (!other || !equal(value, other)) return false;
  }
  return true;
}

bool Comparison::equal(const PropertyValue& left, const PropertyValue& right) noexcept {
  if (left.same_object(right)) return true;
  const PropertyKind kind = left.kind();
  if (kind != right.kind()) return false;
  if (kind < PropertyKind::array) return equal_leaves(left, right);
  if (left.size() != right.size() || !may_enter(left)) return false;
  ++depth_;
  const bool result = kind == PropertyKind::array ? equal_arrays(left, right) : equal_dictionaries(left, right);
  --depth_;
  return result;
}

}  // namespace

bool operator==(const PropertyValue& left, const PropertyValue& right) noexcept {
  if (left.same_object(right)) return true;
  if (left.kind() != right.kind()) return false;
  if (!left.is_container()) return equal_leaves(left, right);
  return Comparison(left).equal(left, right);
}

}  // namespace quorvel
