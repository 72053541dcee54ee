// Arrays, and the room that both kinds of containers grow by.

#include <algorithm>
#include <cstdlib>
#include <cstring>
#include <new>

#include "property/node.h"

namespace quorvel::detail {

ArrayNode* new_array(std::size_t capacity, std::uint8_t flags) noexcept {
  if (capacity > kMaximumSlots) return nullptr;
  void* memory = std::malloc(sizeof(ArrayNode) + capacity * sizeof(Word));
  if (memory == nullptr) return nullptr;
  auto* node = new (memory) ArrayNode;
  node->count.store(1, std::memory_order_relaxed);
  node->kind = PropertyKind::array;
  node->flags = static_cast<std::uint8_t>(flags | kInlineStorage);
  node->used = 0;
  node->capacity = static_cast<std::uint32_t>(capacity);
  node->storage = node + 1;
  node->next = nullptr;
  return node;
}

bool grow_storage(ContainerNode& container, std::size_t slot_size) noexcept {
  const std::size_t capacity = std::max<std::size_t>(4, std::size_t{container.capacity} * 2);
  if (capacity > kMaximumSlots) return false;
  const bool is_inline = (container.flags & kInlineStorage) != 0;
  void* grown = std::realloc(is_inline ? nullptr : container.storage, capacity * slot_size);
  if (grown == nullptr) return false;
  if (is_inline && container.used > 0) std::memcpy(grown, container.storage, container.used * slot_size);
  container.storage = grown;
  container.capacity = static_cast<std::uint32_t>(capacity);
  container.flags = static_cast<std::uint8_t>(container.flags & ~kInlineStorage);
  return true;
}

}  // namespace quorvel::detail
