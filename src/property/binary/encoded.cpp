#include "property/binary/encoded.h"

#include <new>

#include "property/binary/binary.h"
#include "property/binary/binary_check.h"

namespace quorvel {

using namespace detail;

namespace {

// A dictionary without entries of its own, behind which stands the one that its bytes hold.
struct EncodedNode : DictionaryNode {
  ByteBuffer bytes;
  std::atomic<Word> opened;  // the dictionary that was read from the bytes; 0 until somebody looked inside
};

EncodedNode& encoded_node(const DictionaryNode& node) noexcept {
  return const_cast<EncodedNode&>(static_cast<const EncodedNode&>(node));
}

// What an encoded dictionary reads as when there is no memory to take it apart.
const DictionaryNode& empty_dictionary() noexcept {
  static const DictionaryNode empty{};
  return empty;
}

}  // namespace

namespace detail {

// Threads that look inside at once may each read the bytes; the first to finish is the one that all go on with.
const DictionaryNode& open_encoded(const DictionaryNode& node) noexcept {
  EncodedNode& encoded = encoded_node(node);
  Word opened = encoded.opened.load(std::memory_order_acquire);
  if (opened == 0) {
    PropertyValue read = read_binary(encoded.bytes.bytes(), Mutability::immutable);
    if (!read) return empty_dictionary();
    if (encoded.opened.compare_exchange_strong(opened, read.word(), std::memory_order_acq_rel)) opened = read.take();
  }
  return *static_cast<const DictionaryNode*>(node_of(opened));
}

Word end_encoded(DictionaryNode& node) noexcept {
  EncodedNode& encoded = encoded_node(node);
  const Word opened = encoded.opened.load(std::memory_order_acquire);
  encoded.~EncodedNode();
  return opened;
}

}  // namespace detail

PropertyValue read_encoded(ByteBuffer bytes) noexcept {
  if (!is_common_dictionary(bytes.bytes())) return read_binary(bytes.bytes(), Mutability::immutable);
  void* memory = std::malloc(sizeof(EncodedNode));
  if (memory == nullptr) return nullptr;
  auto* node = new (memory) EncodedNode{};
  node->count.store(1, std::memory_order_relaxed);
  node->kind = PropertyKind::dictionary;
  node->flags = kEncoded | kInlineStorage;
  node->bytes = std::move(bytes);
  return PropertyValue::adopt(word_of(node));
}

std::span<const std::byte> encoded_bytes(const PropertyValue& value) noexcept {
  if (!value.is_dictionary() || (node_of(value.word())->flags & kEncoded) == 0) return {};
  return encoded_node(*static_cast<const DictionaryNode*>(node_of(value.word()))).bytes.bytes();
}

}  // namespace quorvel
