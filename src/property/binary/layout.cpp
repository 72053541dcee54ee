#include "property/binary/layout.h"

namespace quorvel::detail {

namespace format = binary_format;

bool BinaryLayout::parse(std::span<const std::byte> bytes) noexcept {
  if (bytes.size() < format::kSmallestFile) return false;
  std::uint64_t table = 0;
  if (!parse_ends(bytes.data(), bytes.data() + bytes.size() - format::kTrailerSize, bytes.size(), table)) return false;
  start_ = bytes.data();
  table_ = start_ + table;
  return true;
}

bool BinaryLayout::parse_ends(const std::byte* header, const std::byte* trailer, std::uint64_t size,
                              std::uint64_t& table) noexcept {
  if (std::memcmp(header, format::kHeader.data(), format::kHeader.size()) != 0) return false;
  const std::uint64_t trailer_offset = size - format::kTrailerSize;
  offset_size_ = static_cast<std::size_t>(trailer[format::kOffsetSizeAt]);
  reference_size_ = static_cast<std::size_t>(trailer[format::kReferenceSizeAt]);
  count_ = format::get_integer(trailer + format::kObjectCountAt, 8);
  top_ = format::get_integer(trailer + format::kTopObjectAt, 8);
  table = format::get_integer(trailer + format::kTableOffsetAt, 8);
  const auto is_width = [](std::size_t width) { return width >= 1 && width <= 8; };
  if (!is_width(offset_size_) || !is_width(reference_size_)) return false;
  if (table <= format::kHeader.size() || table >= trailer_offset) return false;
  if (count_ == 0 || count_ > (trailer_offset - table) / offset_size_) return false;
  unit_sizes_[Marker::kReference] = reference_size_;
  unit_sizes_[Marker::kEntry] = 2 * reference_size_;
  return top_ < count_;
}

// Reads a long size of any width. On entry `object.body` stands where it belongs behind an integer of one byte: three
// bytes behind the object's marker.
bool BinaryLayout::parse_long_size(EncodedObject& object) const noexcept {
  const std::byte* at = object.body - (kLongHead - 1);
  if (at == table_) return false;
  const auto integer = static_cast<std::uint8_t>(*at++);
  if (integer >> 4 != format::kInteger || (integer & 15) > 3) return false;
  const std::size_t width = std::size_t{1} << (integer & 15);
  if (static_cast<std::size_t>(table_ - at) < width) return false;
  object.size = format::get_integer(at, width);
  object.body = at + width;
  return object.size >> 63 == 0;
}

}  // namespace quorvel::detail
