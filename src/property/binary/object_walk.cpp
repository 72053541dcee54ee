#include "property/binary/object_walk.h"

#include "property/unicode.h"

namespace quorvel::detail {

namespace format = binary_format;

namespace {

std::string_view text_of(const EncodedObject& object) noexcept {
  return {reinterpret_cast<const char*>(object.body), object.size};
}

bool fits_64_bits(const EncodedObject& wide_integer) noexcept {
  const std::uint64_t high = format::get_integer(wide_integer.body, 8);
  const std::uint64_t low = format::get_integer(wide_integer.body + 8, 8);
  return high == 0 || (high == UINT64_MAX && low >> 63 == 1);
}

}  // namespace

bool measure_leaf(const EncodedObject& leaf, std::size_t& length) noexcept {
  length = leaf.size;
  switch (leaf.kind) {
    case format::kAsciiText: return is_ascii(text_of(leaf));
    case format::kUtf16Text: length = utf8_length_of_utf16(leaf.body, leaf.size); return length != SIZE_MAX;
    case format::kInteger: return leaf.size < 16 || fits_64_bits(leaf);
    default: return true;
  }
}

bool find_ascii_text(const BinaryLayout& layout, std::uint64_t offset, std::string_view& text) noexcept {
  ShortLeaf leaf;
  if (offset < layout.limit_of(kLargestShortObject) && find_short_leaf(layout.at(offset), leaf)) {
    text = {reinterpret_cast<const char*>(leaf.body), leaf.size};
    return offset >= format::kHeader.size() && leaf.marker.kind == PropertyKind::string;
  }
  EncodedObject object;
  if (!layout.object_at(offset, object) || object.kind != format::kAsciiText) return false;
  text = text_of(object);
  return true;
}

}  // namespace quorvel::detail
