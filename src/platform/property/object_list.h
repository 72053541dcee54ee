// The objects of a property list in the order a writer stores them, before a byte of it is written: the list is
// breadth first, so that it is its own queue, and known in full, so that the exact size is known as well.
#pragma once

#include <cstddef>
#include <cstdint>
#include <span>

#include "platform/property/binary_format.h"
#include "platform/property/leaf_table.h"
#include "platform/property/value.h"

namespace quorvel::detail {

class ObjectList {
 public:
  ObjectList() noexcept = default;
  ObjectList(const ObjectList&) = delete;
  ObjectList& operator=(const ObjectList&) = delete;
  ~ObjectList();

  /// Lists `root` and all that is in it; the list refers to it. Once. False when the value breaks a bound of limits.h
  /// or memory runs out.
  [[nodiscard]] bool build(const PropertyValue& root) noexcept;

  /// The objects, the first of which is the top one.
  [[nodiscard]] std::span<const Word> objects() const noexcept { return {objects_, count_}; }
  /// The numbers that the containers refer to, one container after the other; a dictionary's keys before its values.
  [[nodiscard]] std::span<const std::uint32_t> references() const noexcept { return {references_, reference_count_}; }
  /// The size of all objects without their references, in bytes.
  [[nodiscard]] std::size_t body_size() const noexcept { return body_size_; }

 private:
  [[nodiscard]] bool add_children(const ContainerNode& container) noexcept;
  [[nodiscard]] bool add_dictionary(const DictionaryNode& dictionary) noexcept;
  [[nodiscard]] bool add_array(const ArrayNode& array) noexcept;
  [[nodiscard]] bool add_value(Word word) noexcept;
  [[nodiscard]] bool add_leaf(Word word) noexcept;
  void add_new_leaf(Word word) noexcept;
  [[nodiscard]] bool add_container(Word word) noexcept;
  [[nodiscard]] bool reserve(std::size_t references) noexcept;
  void begin_elements(std::size_t count) noexcept;
  void number_next() noexcept { references_[reference_count_++] = static_cast<std::uint32_t>(count_); }

  PropertyValue root_;
  LeafTable leaves_;
  Word* objects_ = nullptr;
  std::size_t count_ = 0;
  std::size_t capacity_ = 0;
  std::uint32_t* references_ = nullptr;
  std::size_t reference_count_ = 0;
  std::size_t reference_capacity_ = 0;
  std::uint32_t* containers_ = nullptr;  // their numbers: the queue of those whose elements are to be listed
  std::size_t container_count_ = 0;
  std::size_t container_capacity_ = 0;
  std::size_t body_size_ = 0;
  std::uint32_t booleans_[2] = {};  // the numbers of false and true; 0, which is the top object's, for none
  bool fan_checked_ = false;

  // Of the container whose elements are being listed: whether its leaves are worth remembering.
  bool remembers_ = true;
  std::size_t tried_ = 0;
  std::size_t repeated_ = 0;
};

/// The width of an integer object, and the size of a marker that carries `size`, in bytes.
[[nodiscard]] inline std::size_t integer_object_width(Word word) noexcept {
  if (is_node(word)) return (node_of(word)->flags & kUnsigned) != 0 ? 16 : 8;
  const std::int64_t value = immediate_value(word);
  return value < 0 ? 8 : binary_format::integer_width(static_cast<std::uint64_t>(value));
}
[[nodiscard]] inline std::size_t marker_size(std::uint64_t size) noexcept {
  return size < binary_format::kLongSize ? 1 : 2 + binary_format::integer_width(size);
}

}  // namespace quorvel::detail
