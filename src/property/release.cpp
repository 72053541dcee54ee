// The end of values. Containers that fall free together are put on a list and emptied one after the other, so that the
// depth of a value costs no stack.

#include <cstdlib>

#include "property/block_run.h"

namespace quorvel::detail {

namespace {

ContainerNode*& next_of(ContainerNode* container) noexcept {
  if (container->kind == PropertyKind::array) return static_cast<ArrayNode*>(container)->next;
  return static_cast<DictionaryNode*>(container)->next;
}

// Puts a container whose last reference is gone on the list.
void condemn(ContainerNode* container, ContainerNode*& condemned) noexcept {
  if (container->kind == PropertyKind::dictionary) {
    std::free(static_cast<DictionaryNode*>(container)->order.load(std::memory_order_relaxed));
    std::free(static_cast<DictionaryNode*>(container)->index);
  }
  next_of(container) = condemned;
  condemned = container;
}

void drop_words(const Word* words, std::size_t count, ContainerNode*& condemned) noexcept {
  BlockRun<DropReferences> run;
  for (std::size_t i = 0; i < count; ++i) {
    if (!is_node(words[i])) continue;
    Node* node = node_of(words[i]);
    if ((node->flags & kInBlock) != 0) {
      run.add(node);
    } else if ((node->flags & kStatic) == 0 && node->count.fetch_sub(1, std::memory_order_acq_rel) == 1) {
      if (node->kind >= PropertyKind::array) {
        condemn(static_cast<ContainerNode*>(node), condemned);
      } else {
        std::free(node);
      }
    }
  }
}

void release_condemned(ContainerNode* condemned) noexcept {
  while (condemned != nullptr) {
    ContainerNode* container = condemned;
    condemned = next_of(container);
    const std::size_t words_a_slot = container->kind == PropertyKind::dictionary ? 2 : 1;
    drop_words(static_cast<const Word*>(container->storage), container->used * words_a_slot, condemned);
    if ((container->flags & kInlineStorage) == 0) std::free(container->storage);
    std::free(container);
  }
}

}  // namespace

void destroy(Node* node) noexcept {
  if (node->kind < PropertyKind::array) {
    std::free(node);
    return;
  }
  ContainerNode* condemned = nullptr;
  condemn(static_cast<ContainerNode*>(node), condemned);
  release_condemned(condemned);
}

void release_block(Block* block, std::uint64_t references) noexcept {
  if (block->count.fetch_sub(references, std::memory_order_acq_rel) == references) std::free(block);
}

void retain_all(const Word* words, std::size_t count) noexcept {
  BlockRun<TakeReferences> run;
  for (std::size_t i = 0; i < count; ++i) {
    if (!is_node(words[i])) continue;
    Node* node = node_of(words[i]);
    if ((node->flags & kInBlock) != 0) {
      run.add(node);
    } else if ((node->flags & kStatic) == 0) {
      node->count.fetch_add(1, std::memory_order_relaxed);
    }
  }
}

}  // namespace quorvel::detail
