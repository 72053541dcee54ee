#include "platform/property/object_list.h"

#include <algorithm>
#include <cstdlib>

#include "platform/property/sorted_entries.h"
#include "platform/property/unicode.h"
#include "platform/property/walk.h"

namespace quorvel::detail {

namespace {

constexpr std::size_t kMaximumObjects = 0xffff'fffe;

// Remembering every leaf, to store equal ones once, costs more than all the rest of the writing, so it is done where
// leaves repeat: in containers of up to this size always (the keys of many small dictionaries are the same), and in
// larger ones for as long as one in `kWorthwhile` of the first leaves has been seen before.
constexpr std::size_t kAlwaysRemembered = 256;
constexpr std::size_t kWorthwhile = 16;

std::size_t leaf_size(Word word) noexcept {
  switch (kind_of(word)) {
    case PropertyKind::boolean: return 1;
    case PropertyKind::integer: return 1 + integer_object_width(word);
    case PropertyKind::real:
    case PropertyKind::date: return 9;
    default: break;
  }
  const BytesNode* bytes = bytes_of(word);
  if (bytes->kind == PropertyKind::data || (bytes->flags & kAscii) != 0) {
    return marker_size(bytes->length) + bytes->length;
  }
  const std::size_t units = utf16_units(bytes->view());
  return marker_size(units) + 2 * units;
}

template <class T>
bool grow(T*& row, std::size_t& capacity, std::size_t needed) noexcept {
  if (needed <= capacity) return true;
  const std::size_t larger = std::max({needed, capacity * 2, std::size_t{16}});
  void* grown = std::realloc(row, larger * sizeof(T));
  if (grown == nullptr) return false;
  row = static_cast<T*>(grown);
  capacity = larger;
  return true;
}

}  // namespace

ObjectList::~ObjectList() {
  std::free(objects_);
  std::free(references_);
  std::free(containers_);
}

// Each reference adds at most one object, so that nothing else has to make room.
bool ObjectList::reserve(std::size_t references) noexcept {
  return count_ + references <= kMaximumObjects && grow(objects_, capacity_, count_ + references) &&
         grow(references_, reference_capacity_, reference_count_ + references);
}

void ObjectList::begin_elements(std::size_t count) noexcept {
  remembers_ = true;
  tried_ = count <= kAlwaysRemembered ? 0 : 1;
  repeated_ = 0;
}

void ObjectList::add_new_leaf(Word word) noexcept {
  number_next();
  objects_[count_++] = word;
  body_size_ += leaf_size(word);
}

bool ObjectList::add_leaf(Word word) noexcept {
  if (kind_of(word) == PropertyKind::boolean) {
    std::uint32_t& number = booleans_[word == kTrue ? 1 : 0];
    if (number == 0) {
      number = static_cast<std::uint32_t>(count_);
      add_new_leaf(word);
    } else {
      references_[reference_count_++] = number;
    }
    return true;
  }
  if (!remembers_) {
    add_new_leaf(word);
    return true;
  }
  std::uint32_t number = static_cast<std::uint32_t>(count_);
  const LeafTable::Outcome outcome = leaves_.find_or_add(word, objects_, number);
  if (outcome == LeafTable::Outcome::no_memory) return false;
  if (outcome == LeafTable::Outcome::added) {
    add_new_leaf(word);
  } else {
    references_[reference_count_++] = number;
    ++repeated_;
  }
  if (tried_ > 0 && ++tried_ > kAlwaysRemembered) {
    remembers_ = repeated_ * kWorthwhile >= kAlwaysRemembered;
    tried_ = 0;
  }
  return true;
}

// A container below the top one with several holders may be met again and again: the whole walk is measured once
// before the first such container is entered.
bool ObjectList::add_container(Word word) noexcept {
  if (!fan_checked_ && node_of(word)->count.load(std::memory_order_relaxed) > 1) {
    fan_checked_ = true;
    if (!is_within_limits(root_)) return false;
  }
  if (!grow(containers_, container_capacity_, container_count_ + 1)) return false;
  containers_[container_count_++] = static_cast<std::uint32_t>(count_);
  number_next();
  objects_[count_++] = word;
  return true;
}

bool ObjectList::add_value(Word word) noexcept {
  return kind_of(word) < PropertyKind::array ? add_leaf(word) : add_container(word);
}

bool ObjectList::add_dictionary(const DictionaryNode& dictionary) noexcept {
  const std::size_t size = dictionary.live;
  body_size_ += marker_size(size);
  const SortedEntries sorted(dictionary);
  if (!sorted || !reserve(size * 2)) return false;
  // The keys of one dictionary differ: in a large one they are not looked up among each other.
  if (size > kAlwaysRemembered) {
    for (std::size_t i = 0; i < size; ++i) add_new_leaf(sorted[i].key);
  } else {
    begin_elements(size);
    for (std::size_t i = 0; i < size; ++i) {
      if (!add_leaf(sorted[i].key)) return false;
    }
  }
  begin_elements(size);
  for (std::size_t i = 0; i < size; ++i) {
    if (!add_value(sorted[i].value)) return false;
  }
  return true;
}

bool ObjectList::add_array(const ArrayNode& array) noexcept {
  body_size_ += marker_size(array.used);
  if (!reserve(array.used)) return false;
  begin_elements(array.used);
  for (std::size_t i = 0; i < array.used; ++i) {
    if (!add_value(array.items()[i])) return false;
  }
  return true;
}

bool ObjectList::add_children(const ContainerNode& container) noexcept {
  return container.kind == PropertyKind::array ? add_array(static_cast<const ArrayNode&>(container))
                                               : add_dictionary(static_cast<const DictionaryNode&>(container));
}

bool ObjectList::build(const PropertyValue& root) noexcept {
  root_ = root;
  if (!reserve(1) || !grow(containers_, container_capacity_, 1)) return false;
  objects_[count_++] = root.word();
  if (!root.is_container()) {
    body_size_ = leaf_size(root.word());
    return true;
  }
  containers_[container_count_++] = 0;
  if (root.is_dictionary()) objects_[0] = word_of(&dictionary_at(root.word()));
  std::size_t level_end = 1, depth = 1;
  for (std::size_t i = 0; i < container_count_; ++i) {
    if (i == level_end) {
      level_end = container_count_;
      ++depth;
    }
    const Node* container = node_of(objects_[containers_[i]]);
    if (depth > kMaximumDepth || !add_children(*static_cast<const ContainerNode*>(container))) return false;
  }
  return true;
}

}  // namespace quorvel::detail
