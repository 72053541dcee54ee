#include <cstring>

#include "property/walk.h"

namespace quorvel {

using namespace detail;

namespace {

bool equal(const PropertyValue& left, const PropertyValue& right, WalkBudget& budget) noexcept;

bool equal_arrays(const PropertyValue& left, const PropertyValue& right, WalkBudget& budget) noexcept {
  for (std::size_t i = 0; i < left.size(); ++i) {
    if (!equal(left.at(i), right.at(i), budget)) return false;
  }
  return true;
}

bool equal_dictionaries(const PropertyValue& left, const PropertyValue& right, WalkBudget& budget) noexcept {
  for (const auto& [key, value] : left.entries()) {
    const PropertyValue& other = right.get(key.text());
    if (!other || !equal(value, other, budget)) return false;
  }
  return true;
}

bool equal_leaves(const PropertyValue& left, const PropertyValue& right) noexcept {
  return is_node(left.word()) && is_node(right.word()) && text_of(left.word()) == text_of(right.word());
}

bool equal(const PropertyValue& left, const PropertyValue& right, WalkBudget& budget) noexcept {
  if (left.same_object(right)) return true;
  const PropertyKind kind = left.kind();
  if (kind != right.kind()) return false;
  if (kind < PropertyKind::array) return equal_leaves(left, right);
  if (left.size() != right.size() || !budget.enter(left)) return false;
  const bool result =
      kind == PropertyKind::array ? equal_arrays(left, right, budget) : equal_dictionaries(left, right, budget);
  budget.leave();
  return result;
}

}  // namespace

bool operator==(const PropertyValue& left, const PropertyValue& right) noexcept {
  if (left.same_object(right)) return true;
  if (left.kind() != right.kind()) return false;
  if (!left.is_container()) return equal_leaves(left, right);
  WalkBudget budget;
  return equal(left, right, budget);
}

}  // namespace quorvel
