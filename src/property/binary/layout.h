// The bones of a binary property list: its trailer, its offset table and where each object begins and ends. All
// readers look at a file's bytes through this class, which checks every number before it is used.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <span>

#include "property/binary/format.h"

namespace quorvel::detail {

[[nodiscard]] constexpr bool is_container_kind(unsigned kind) noexcept {
  return kind == binary_format::kArray || kind == binary_format::kDictionary;
}

/// The common form of a long size is an integer of one byte: the marker of the object, that of the integer, the byte.
inline constexpr auto kOneByteInteger = static_cast<std::byte>(binary_format::kInteger << 4);
inline constexpr std::uint8_t kLongHead = 3;

/// One object, taken apart but not looked into.
struct EncodedObject {
  std::uint8_t kind;    // the marker's high four bits
  std::uint8_t nibble;  // its low four
  std::uint64_t size;   // bytes of a number, elements of a text, data or container
  const std::byte* body;
  const std::byte* end;
  [[nodiscard]] bool is_container() const noexcept { return is_container_kind(kind); }
};

/// What a marker says of its object; `unit` 0 for a marker that has no kind here.
struct Marker {
  enum Unit : std::uint8_t { kNone, kByte, kCodeUnit, kReference, kEntry };
  std::uint8_t size;  // in units, unless `is_long`
  Unit unit;
  bool is_long;  // the size stands in an integer object behind the marker
};

/// For each byte, the marker that it is.
inline constexpr std::array<Marker, 256> kMarkers = [] {
  namespace format = binary_format;
  std::array<Marker, 256> markers{};
  markers[format::kFalse] = markers[format::kTrue] = {0, Marker::kByte, false};
  markers[format::kDate] = {8, Marker::kByte, false};
  for (unsigned n = 0; n <= 4; ++n) {
    markers[format::kInteger << 4 | n] = {static_cast<std::uint8_t>(1U << n), Marker::kByte, false};
  }
  for (const unsigned n : {2U, 3U}) {
    markers[format::kReal << 4 | n] = {static_cast<std::uint8_t>(1U << n), Marker::kByte, false};
  }
  for (unsigned n = 0; n <= format::kLongSize; ++n) {
    const bool is_long = n == format::kLongSize;
    const auto size = static_cast<std::uint8_t>(n);
    markers[format::kData << 4 | n] = markers[format::kAsciiText << 4 | n] = {size, Marker::kByte, is_long};
    markers[format::kUtf16Text << 4 | n] = {size, Marker::kCodeUnit, is_long};
    markers[format::kArray << 4 | n] = {size, Marker::kReference, is_long};
    markers[format::kDictionary << 4 | n] = {size, Marker::kEntry, is_long};
  }
  return markers;
}();

class BinaryLayout {
 public:
  /// Takes in the trailer of `bytes`, which must outlive the layout. False when it cannot be one.
  [[nodiscard]] bool parse(std::span<const std::byte> bytes) noexcept;
  /// Takes in the header and the trailer of a file of `size` bytes, `kSmallestFile` at least, and where its offset
  /// table begins; nothing of the objects is there yet. False when they cannot be a header and a trailer of such a
  /// file.
  [[nodiscard]] bool parse_ends(const std::byte* header, const std::byte* trailer, std::uint64_t size,
                                std::uint64_t& table) noexcept;

  [[nodiscard]] std::uint64_t count() const noexcept { return count_; }
  [[nodiscard]] std::uint64_t top() const noexcept { return top_; }
  [[nodiscard]] std::size_t reference_size() const noexcept { return reference_size_; }

  /// Where object `index`, which is below the count, is said to begin.
  [[nodiscard]] std::uint64_t offset_of(std::uint64_t index) const noexcept {
    return binary_format::get_integer(table_ + index * offset_size_, offset_size_);
  }
  /// The byte at an offset inside the file, and the other way round.
  [[nodiscard]] const std::byte* at(std::uint64_t offset) const noexcept { return start_ + offset; }
  [[nodiscard]] std::uint64_t offset_at(const std::byte* at) const noexcept {
    return static_cast<std::uint64_t>(at - start_);
  }
  /// Below this offset, an object of at most `size` bytes ends before the table.
  [[nodiscard]] std::uint64_t limit_of(std::size_t size) const noexcept {
    const std::uint64_t end = offset_at(table_);
    return end < size ? 0 : end - size;
  }
  /// The reference at `at`, which may be out of range.
  [[nodiscard]] std::uint64_t reference_at(const std::byte* at) const noexcept {
    return binary_format::get_integer(at, reference_size_);
  }
  /// The marker at an offset, or null when no object can begin there.
  [[nodiscard]] const std::byte* marker_at(std::uint64_t offset) const noexcept {
    const bool is_inside =
        offset >= binary_format::kHeader.size() && offset < static_cast<std::uint64_t>(table_ - start_);
    return is_inside ? start_ + offset : nullptr;
  }
  /// Takes an object apart. False when none can begin at `offset`, or it does not end before the table.
  [[nodiscard]] bool object_at(std::uint64_t offset, EncodedObject& object) const noexcept;

 private:
  [[nodiscard]] bool parse_long_size(EncodedObject& object) const noexcept;

  const std::byte* start_ = nullptr;
  const std::byte* table_ = nullptr;  // where the objects end as well
  std::size_t offset_size_ = 0;
  std::size_t reference_size_ = 0;
  std::uint64_t count_ = 0;
  std::uint64_t top_ = 0;
  std::size_t unit_sizes_[5] = {0, 1, 2, 0, 0};  // by Marker::Unit, in bytes
};

// Called for containers and for leaves that are not short. A branch on whether a size is long would be mispredicted, so
// the common form of a long one, a single byte behind an integer's marker, is read without one; the two bytes behind
// the last object can be read, because the trailer follows.
inline bool BinaryLayout::object_at(std::uint64_t offset, EncodedObject& object) const noexcept {
  const std::byte* at = marker_at(offset);
  if (at == nullptr) return false;
  const auto byte = static_cast<std::uint8_t>(*at);
  const Marker marker = kMarkers[byte];
  object.kind = byte >> 4;
  object.nibble = byte & 15;
  object.size = marker.is_long ? static_cast<std::uint64_t>(at[2]) : marker.size;
  object.body = at + (marker.is_long ? kLongHead : 1);
  // NOLINTNEXTLINE(readability-implicit-bool-conversion): && would branch
  if ((marker.is_long & (at[1] != kOneByteInteger)) != 0 && !parse_long_size(object)) return false;
  // A size that would make the multiplication wrap exceeds the room, and is refused before it.
  const std::size_t unit = unit_sizes_[marker.unit];
  const std::ptrdiff_t room = table_ - object.body;
  if (unit == 0 || room < 0 || object.size > static_cast<std::uint64_t>(room)) return false;
  if (object.size * unit > static_cast<std::uint64_t>(room)) return false;
  object.end = object.body + object.size * unit;
  return true;
}

}  // namespace quorvel::detail
