#include "platform/property/leaf_reader.h"

namespace quorvel::detail {

namespace format = binary_format;

Word make_wide_text(const EncodedObject& object, LeafAllocator& leaves) noexcept {
  const std::size_t length = utf8_length_of_utf16(object.body, object.size);
  if (length == SIZE_MAX) return 0;
  // A text that ASCII could have held is marked as what it is, so that it is written as such.
  const std::uint8_t flags = length == object.size ? kAscii : 0;
  BytesNode* node = leaves.add_bytes(PropertyKind::string, length, flags);
  if (node == nullptr) return 0;
  write_utf8(object.body, object.size, node->bytes());
  return word_of(node);
}

Word make_wide_integer(const EncodedObject& object, LeafAllocator& leaves) noexcept {
  const bool is_wide = object.size == 16;
  if (is_wide && !fits_64_bits(object)) return 0;
  const std::uint64_t value = format::get_integer(object.end - 8, 8);
  const bool is_large = is_wide && *object.body == std::byte{0} && value >> 63 != 0;
  const auto number = static_cast<std::int64_t>(value);
  if (!is_large && number >= kImmediateMinimum && number <= kImmediateMaximum) return immediate_integer(number);
  return leaves.add_number(PropertyKind::integer, value, is_large ? std::uint8_t{kUnsigned} : std::uint8_t{0});
}

Word make_real(const EncodedObject& object, LeafAllocator& leaves) noexcept {
  std::uint64_t bits = format::get_integer(object.body, object.size);
  if (object.size == 4) {
    bits = std::bit_cast<std::uint64_t>(double{std::bit_cast<float>(static_cast<std::uint32_t>(bits))});
  }
  return leaves.add_number(object.kind == format::kReal ? PropertyKind::real : PropertyKind::date, bits, 0);
}

}  // namespace quorvel::detail
