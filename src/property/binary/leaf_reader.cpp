#include "property/binary/leaf_reader.h"

#include <bit>

#include "property/unicode.h"

namespace quorvel::detail {

namespace format = binary_format;

namespace {

// A text in ASCII, or data.
Word make_bytes(const EncodedObject& object, PropertyKind kind, LeafAllocator& leaves) noexcept {
  BytesNode* node = leaves.add_bytes(kind, object.size, kVerbatim);
  if (node == nullptr) return 0;
  std::memcpy(node->bytes(), object.body, object.size);
  return word_of(node);
}

Word make_wide_text(const EncodedObject& object, std::size_t length, LeafAllocator& leaves) noexcept {
  // As many bytes as code units: every character is ASCII, and the text is written as such.
  const std::uint8_t flags = length == object.size ? kVerbatim : 0;
  BytesNode* node = leaves.add_bytes(PropertyKind::string, length, flags);
  if (node == nullptr) return 0;
  write_utf8(object.body, object.size, node->bytes());
  return word_of(node);
}

Word make_number(PropertyKind kind, std::uint64_t bits, std::size_t length, LeafAllocator& leaves) noexcept {
  return finish_number(leaves.add_bytes(kind, length, kVerbatim), bits);
}

Word make_integer(const EncodedObject& object, LeafAllocator& leaves) noexcept {
  const bool is_wide = object.size == 16;
  const std::uint64_t value =
      is_wide ? format::get_integer(object.end - 8, 8) : format::get_integer(object.body, object.size);
  const bool is_large = is_wide && *object.body == std::byte{0} && value >> 63 != 0;
  const auto number = static_cast<std::int64_t>(value);
  if (!is_large && number >= kImmediateMinimum && number <= kImmediateMaximum) return immediate_integer(number);
  return make_number(PropertyKind::integer, value, is_large ? 16 : 8, leaves);
}

Word make_real(const EncodedObject& object, LeafAllocator& leaves) noexcept {
  std::uint64_t bits = format::get_integer(object.body, object.size);
  if (object.size == 4) {
    bits = std::bit_cast<std::uint64_t>(double{std::bit_cast<float>(static_cast<std::uint32_t>(bits))});
  }
  return make_number(object.kind == format::kReal ? PropertyKind::real : PropertyKind::date, bits, 8, leaves);
}

}  // namespace

Word make_leaf(const EncodedObject& object, std::size_t length, LeafAllocator& leaves) noexcept {
  switch (object.kind) {
    case format::kAsciiText: return make_bytes(object, PropertyKind::string, leaves);
    case format::kData: return make_bytes(object, PropertyKind::data, leaves);
    case format::kInteger: return make_integer(object, leaves);
    case format::kFalse >> 4: return object.nibble == (format::kTrue & 15) ? kTrue : kFalse;
    case format::kUtf16Text: return make_wide_text(object, length, leaves);
    default: return make_real(object, leaves);
  }
}

}  // namespace quorvel::detail
