#include <cstdlib>
#include <cstring>
#include <limits>
#include <new>

#include "property/binary/format.h"
#include "property/node.h"

namespace quorvel::detail {

BytesNode* new_bytes(PropertyKind kind, std::size_t length, std::uint8_t flags) noexcept {
  if (length > std::numeric_limits<std::uint32_t>::max()) return nullptr;
  void* memory = std::malloc(BytesNode::allocation(length));
  if (memory == nullptr) return nullptr;
  return new (memory) BytesNode{{1, kind, flags, 0}, static_cast<std::uint32_t>(length)};
}

Word finish_number(BytesNode* node, std::uint64_t bits) noexcept {
  if (node == nullptr) return 0;
  auto* bytes = reinterpret_cast<std::byte*>(node->bytes());
  std::memset(bytes, 0, node->length);
  binary_format::put_integer(bytes + node->length - 8, bits, 8);
  return word_of(node);
}

}  // namespace quorvel::detail
