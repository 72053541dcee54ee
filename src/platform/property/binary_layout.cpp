#include "platform/property/binary_layout.h"

namespace quorvel::detail {

namespace format = binary_format;

bool BinaryLayout::parse(std::span<const std::byte> bytes) noexcept {
  if (bytes.size() < format::kSmallestFile) return false;
  if (std::memcmp(bytes.data(), format::kHeader.data(), format::kHeader.size()) != 0) return false;
  const std::uint64_t trailer_offset = bytes.size() - format::kTrailerSize;
  const std::byte* trailer = bytes.data() + trailer_offset;
  start_ = bytes.data();
  offset_size_ = static_cast<std::size_t>(trailer[format::kOffsetSizeAt]);
  reference_size_ = static_cast<std::size_t>(trailer[format::kReferenceSizeAt]);
  count_ = format::get_integer(trailer + format::kObjectCountAt, 8);
  top_ = format::get_integer(trailer + format::kTopObjectAt, 8);
  const std::uint64_t table = format::get_integer(trailer + format::kTableOffsetAt, 8);
  const auto is_width = [](std::size_t width) { return width >= 1 && width <= 8; };
  if (!is_width(offset_size_) || !is_width(reference_size_)) return false;
  if (table <= format::kHeader.size() || table >= trailer_offset) return false;
  if (count_ == 0 || count_ > (trailer_offset - table) / offset_size_) return false;
  table_ = start_ + table;
  return top_ < count_;
}

// The size in a marker's nibble, or in the integer object behind it.
inline bool BinaryLayout::parse_size(EncodedObject& object) const noexcept {
  object.size = object.nibble;
  if (object.nibble != format::kLongSize) return true;
  if (object.body == table_) return false;
  const auto integer = static_cast<std::uint8_t>(*object.body++);
  if (integer >> 4 != format::kInteger || (integer & 15) > 3) return false;
  const std::size_t width = std::size_t{1} << (integer & 15);
  if (static_cast<std::size_t>(table_ - object.body) < width) return false;
  object.size = format::get_integer(object.body, width);
  object.body += width;
  return object.size >> 63 == 0;
}

bool BinaryLayout::object_at(std::uint64_t offset, EncodedObject& object) const noexcept {
  const std::byte* marker = marker_at(offset);
  if (marker == nullptr) return false;
  object.kind = static_cast<std::uint8_t>(*marker) >> 4;
  object.nibble = static_cast<std::uint8_t>(*marker) & 15;
  object.body = marker + 1;
  std::size_t unit = 1;
  switch (object.kind) {
    case format::kFalse >> 4:
      object.size = 0;
      if (object.nibble != (format::kFalse & 15) && object.nibble != (format::kTrue & 15)) return false;
      break;
    case format::kInteger:
      if (object.nibble > 4) return false;
      object.size = std::uint64_t{1} << object.nibble;
      break;
    case format::kReal:
      if (object.nibble != 2 && object.nibble != 3) return false;
      object.size = std::uint64_t{1} << object.nibble;
      break;
    case format::kDate >> 4:
      if (object.nibble != (format::kDate & 15)) return false;
      object.size = 8;
      break;
    case format::kUtf16Text:
    case format::kData:
    case format::kAsciiText:
    case format::kArray:
    case format::kDictionary:
      if (!parse_size(object)) return false;
      if (object.kind == format::kUtf16Text) unit = 2;
      if (object.kind == format::kArray) unit = reference_size_;
      if (object.kind == format::kDictionary) unit = 2 * reference_size_;
      break;
    default: return false;
  }
  // A multiplication that would wrap is of a size that the room rules out first.
  const auto room = static_cast<std::uint64_t>(table_ - object.body);
  if (object.size > room || object.size * unit > room) return false;
  object.end = object.body + object.size * unit;
  return true;
}

bool fits_64_bits(const EncodedObject& wide_integer) noexcept {
  const std::uint64_t high = format::get_integer(wide_integer.body, 8);
  const std::uint64_t low = format::get_integer(wide_integer.body + 8, 8);
  return high == 0 || (high == UINT64_MAX && low >> 63 == 1);
}

}  // namespace quorvel::detail
