// Writing happens in two passes: the objects are listed first (object_list.h), then written in the order of their
// numbers into one buffer of the exact size.

#include <algorithm>
#include <bit>
#include <cstring>

#include "platform/property/binary.h"
#include "platform/property/binary_format.h"
#include "platform/property/object_list.h"
#include "platform/property/unicode.h"

namespace quorvel {

namespace format = binary_format;
using namespace detail;

namespace {

// Each of these writes at `at` and returns where it ended.

// Most texts are short: for those a call costs more than the copy.
inline std::byte* put_bytes(std::byte* at, const char* bytes, std::size_t count) noexcept {
  const auto copy = [=]<std::size_t Width>(std::integral_constant<std::size_t, Width>) {
    std::memcpy(at, bytes, Width);
    std::memcpy(at + count - Width, bytes + count - Width, Width);
  };
  if (count > 64 || count < 4) {
    if (count > 0) std::memcpy(at, bytes, count);
  } else if (count > 32) {
    copy(std::integral_constant<std::size_t, 32>{});
  } else if (count > 16) {
    copy(std::integral_constant<std::size_t, 16>{});
  } else if (count >= 8) {
    copy(std::integral_constant<std::size_t, 8>{});
  } else {
    copy(std::integral_constant<std::size_t, 4>{});
  }
  return at + count;
}

inline std::byte* put_integer_object(std::byte* at, std::uint64_t value, std::size_t width) noexcept {
  *at++ = static_cast<std::byte>(format::kInteger << 4 | std::countr_zero(static_cast<unsigned>(width)));
  if (width == 16) {
    format::put_integer(at, 0, 8);
    format::put_integer(at + 8, value, 8);
  } else {
    format::put_integer(at, value, width);
  }
  return at + width;
}

inline std::byte* put_marker(std::byte* at, unsigned kind, std::uint64_t size) noexcept {
  const auto nibble = static_cast<unsigned>(std::min<std::uint64_t>(size, format::kLongSize));
  *at++ = static_cast<std::byte>(kind << 4 | nibble);
  return nibble == format::kLongSize ? put_integer_object(at, size, format::integer_width(size)) : at;
}

inline std::byte* put_text(std::byte* at, const BytesNode& text) noexcept {
  if ((text.flags & kAscii) != 0) {
    return put_bytes(put_marker(at, format::kAsciiText, text.length), text.bytes(), text.length);
  }
  return write_utf16(text.view(), put_marker(at, format::kUtf16Text, utf16_units(text.view())));
}

inline std::byte* put_leaf(std::byte* at, Word word) noexcept {
  const auto bits = [word] { return static_cast<const NumberNode*>(node_of(word))->bits; };
  switch (const PropertyKind kind = kind_of(word)) {
    case PropertyKind::string: return put_text(at, *bytes_of(word));
    case PropertyKind::boolean:
      *at = static_cast<std::byte>(word == kTrue ? format::kTrue : format::kFalse);
      return at + 1;
    case PropertyKind::integer: {
      const std::uint64_t value = is_node(word) ? bits() : static_cast<std::uint64_t>(immediate_value(word));
      return put_integer_object(at, value, integer_object_width(word));
    }
    case PropertyKind::data:
      return put_bytes(put_marker(at, format::kData, bytes_of(word)->length), bytes_of(word)->bytes(),
                       bytes_of(word)->length);
    default:
      *at = static_cast<std::byte>(kind == PropertyKind::date ? format::kDate : format::kReal << 4 | 3);
      format::put_integer(at + 1, bits(), 8);
      return at + 9;
  }
}

class Emitter {
 public:
  Emitter(const ObjectList& list, std::byte* start, std::size_t table_offset, std::size_t reference_size) noexcept
      : list_(list),
        start_(start),
        table_(start + table_offset),
        next_reference_(list.references().data()),
        reference_size_(reference_size) {}

  // Writes the objects, and their offsets into the table.
  template <std::size_t OffsetSize>
  void put_objects() noexcept {
    std::byte* slot = table_;
    std::byte* at = put_bytes(start_, format::kHeader.data(), format::kHeader.size());
    for (const Word word : list_.objects()) {
      format::put_integer(slot, static_cast<std::uint64_t>(at - start_), OffsetSize);
      slot += OffsetSize;
      if (kind_of(word) < PropertyKind::array) {
        at = put_leaf(at, word);
      } else {
        at = put_container(at, *static_cast<const ContainerNode*>(node_of(word)));
      }
    }
  }

 private:
  template <std::size_t Size>
  std::byte* put_references(std::byte* at, std::size_t count) noexcept {
    for (; count > 0; --count, at += Size) format::put_integer(at, *next_reference_++, Size);
    return at;
  }

  std::byte* put_container(std::byte* at, const ContainerNode& container) noexcept {
    const bool is_dictionary = container.kind == PropertyKind::dictionary;
    const std::size_t size = is_dictionary ? static_cast<const DictionaryNode&>(container).live : container.used;
    const std::size_t references = is_dictionary ? size * 2 : size;
    at = put_marker(at, is_dictionary ? format::kDictionary : format::kArray, size);
    switch (reference_size_) {
      case 1: return put_references<1>(at, references);
      case 2: return put_references<2>(at, references);
      default: return put_references<4>(at, references);
    }
  }

  const ObjectList& list_;
  std::byte* start_;
  std::byte* table_;
  const std::uint32_t* next_reference_;
  std::size_t reference_size_;
};

void put_trailer(std::byte* trailer, std::size_t offset_size, std::size_t reference_size, std::size_t count,
                 std::size_t table_offset) noexcept {
  std::memset(trailer, 0, format::kTrailerSize);
  trailer[format::kOffsetSizeAt] = static_cast<std::byte>(offset_size);
  trailer[format::kReferenceSizeAt] = static_cast<std::byte>(reference_size);
  format::put_integer(trailer + format::kObjectCountAt, count, 8);
  format::put_integer(trailer + format::kTableOffsetAt, table_offset, 8);
}

}  // namespace

bool write_binary(const PropertyValue& value, ByteBuffer& out) noexcept {
  ObjectList list;
  if (!value || !list.build(value)) return false;
  const std::size_t count = list.objects().size();
  const std::size_t reference_size = format::integer_width(count - 1);
  const std::size_t table_offset =
      format::kHeader.size() + list.body_size() + list.references().size() * reference_size;
  const std::size_t offset_size = format::integer_width(table_offset);
  const std::size_t table_end = table_offset + count * offset_size;
  const std::size_t before = out.size();
  if (!out.resize(before + table_end + format::kTrailerSize)) return false;
  std::byte* const start = out.data() + before;
  Emitter emitter(list, start, table_offset, reference_size);
  switch (offset_size) {
    case 1: emitter.put_objects<1>(); break;
    case 2: emitter.put_objects<2>(); break;
    case 4: emitter.put_objects<4>(); break;
    default: emitter.put_objects<8>();
  }
  put_trailer(start + table_end, offset_size, reference_size, count, table_offset);
  return true;
}

}  // namespace quorvel
