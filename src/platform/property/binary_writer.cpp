// Writing happens in two passes. The first walks the value breadth first, so that the list of objects is its own queue,
// numbers every object and notes the references of every container; each distinct leaf gets one number. The exact size
// is known then. The second pass writes the objects in the order of their numbers into one buffer.

#include <algorithm>
#include <bit>
#include <cstdlib>
#include <cstring>

#include "platform/property/binary.h"
#include "platform/property/binary_format.h"
#include "platform/property/leaf_table.h"
#include "platform/property/sorted_entries.h"
#include "platform/property/unicode.h"
#include "platform/property/walk.h"

namespace quorvel {

namespace format = binary_format;
using namespace detail;

namespace {

std::size_t integer_object_width(Word word) noexcept {
  if (!is_node(word)) {
    const std::int64_t value = immediate_value(word);
    return value < 0 ? 8 : format::integer_width(static_cast<std::uint64_t>(value));
  }
  const auto* node = static_cast<const NumberNode*>(node_of(word));
  return (node->flags & kUnsigned) != 0 ? 16 : 8;
}

// The size of a marker whose nibble carries `size`, with the integer object that a long size needs.
std::size_t marker_size(std::uint64_t size) noexcept {
  return size < format::kLongSize ? 1 : 2 + format::integer_width(size);
}

std::size_t leaf_size(Word word) noexcept {
  switch (kind_of(word)) {
    case PropertyKind::boolean: return 1;
    case PropertyKind::integer: return 1 + integer_object_width(word);
    case PropertyKind::real:
    case PropertyKind::date: return 9;
    case PropertyKind::data: return marker_size(bytes_of(word)->length) + bytes_of(word)->length;
    default: break;
  }
  const BytesNode* text = bytes_of(word);
  if ((text->flags & kAscii) != 0) return marker_size(text->length) + text->length;
  const std::size_t units = utf16_units(text->view());
  return marker_size(units) + 2 * units;
}

class Writer {
 public:
  explicit Writer(ByteBuffer& out) noexcept : out_(out) {}
  ~Writer() {
    std::free(objects_);
    std::free(references_);
  }
  Writer(const Writer&) = delete;
  Writer& operator=(const Writer&) = delete;

  [[nodiscard]] bool write(const PropertyValue& root) noexcept {
    return number(root) && lay_out() && (emit_objects(), emit_trailer(), true);
  }

 private:
  static constexpr std::uint64_t kMaximumObjects = 0xffff'ffff;

  // First pass.
  bool number(const PropertyValue& root) noexcept;
  bool number_children(const ContainerNode& container) noexcept;
  bool number_dictionary(const DictionaryNode& dictionary) noexcept;
  bool reference(Word word) noexcept;
  bool add_object(Word word) noexcept;
  bool reserve_references(std::size_t more) noexcept;
  bool may_fan_out(Word container) noexcept;

  // Second pass.
  bool lay_out() noexcept;
  void emit_objects() noexcept;
  void emit_leaf(Word word) noexcept;
  void emit_text(const BytesNode& text) noexcept;
  void emit_container(const ContainerNode& container) noexcept;
  void emit_marker(std::uint8_t kind, std::uint64_t size) noexcept;
  void emit_integer(std::uint64_t value, std::size_t width) noexcept;
  void emit_bytes(std::string_view bytes) noexcept;
  void emit_trailer() noexcept;

  ByteBuffer& out_;
  PropertyValue root_;
  LeafTable leaves_;
  Word* objects_ = nullptr;
  std::size_t object_count_ = 0;
  std::size_t object_capacity_ = 0;
  std::uint32_t* references_ = nullptr;
  std::size_t reference_count_ = 0;
  std::size_t reference_capacity_ = 0;
  bool fan_checked_ = false;
  std::size_t body_size_ = 0;  // of all objects, without their references

  std::byte* start_ = nullptr;
  std::byte* at_ = nullptr;
  const std::uint32_t* next_reference_ = nullptr;
  std::size_t reference_size_ = 0;
  std::size_t offset_size_ = 0;
  std::size_t table_offset_ = 0;
};

bool Writer::add_object(Word word) noexcept {
  if (object_count_ == object_capacity_) {
    const std::size_t capacity = std::max<std::size_t>(64, object_capacity_ * 2);
    void* grown = std::realloc(objects_, capacity * sizeof(Word));
    if (grown == nullptr || object_count_ >= kMaximumObjects) {
      if (grown != nullptr) objects_ = static_cast<Word*>(grown);
      return false;
    }
    objects_ = static_cast<Word*>(grown);
    object_capacity_ = capacity;
  }
  objects_[object_count_++] = word;
  return true;
}

bool Writer::reserve_references(std::size_t more) noexcept {
  if (more <= reference_capacity_ - reference_count_) return true;
  const std::size_t capacity = std::max(reference_count_ + more, reference_capacity_ * 2);
  void* grown = std::realloc(references_, capacity * sizeof(std::uint32_t));
  if (grown == nullptr) return false;
  references_ = static_cast<std::uint32_t*>(grown);
  reference_capacity_ = capacity;
  return true;
}

// A container below the root with several holders may be met again and again: the whole walk is measured once before
// the first such container is entered.
bool Writer::may_fan_out(Word container) noexcept {
  if (fan_checked_ || node_of(container)->count.load(std::memory_order_relaxed) == 1) return false;
  fan_checked_ = true;
  return !is_within_limits(root_);
}

bool Writer::reference(Word word) noexcept {
  std::uint32_t number = static_cast<std::uint32_t>(object_count_);
  if (kind_of(word) >= PropertyKind::array) {
    if (may_fan_out(word) || !add_object(word)) return false;
  } else {
    const LeafTable::Outcome outcome = leaves_.find_or_add(word, objects_, number);
    if (outcome == LeafTable::Outcome::no_memory) return false;
    if (outcome == LeafTable::Outcome::added) {
      if (!add_object(word)) return false;
      body_size_ += leaf_size(word);
    }
  }
  references_[reference_count_++] = number;
  return true;
}

bool Writer::number_dictionary(const DictionaryNode& dictionary) noexcept {
  const SortedEntries sorted(dictionary);
  if (!sorted || !leaves_.reserve(std::size_t{dictionary.live} * 2)) return false;
  for (std::size_t i = 0; i < dictionary.live; ++i) {
    if (!reference(sorted[i].key)) return false;
  }
  for (std::size_t i = 0; i < dictionary.live; ++i) {
    if (!reference(sorted[i].value)) return false;
  }
  return true;
}

bool Writer::number_children(const ContainerNode& container) noexcept {
  const bool is_dictionary = container.kind == PropertyKind::dictionary;
  const std::size_t size = is_dictionary ? static_cast<const DictionaryNode&>(container).live : container.used;
  body_size_ += marker_size(size);
  if (!reserve_references(is_dictionary ? size * 2 : size)) return false;
  if (is_dictionary) return number_dictionary(static_cast<const DictionaryNode&>(container));
  const Word* items = static_cast<const ArrayNode&>(container).items();
  for (std::size_t i = 0; i < size; ++i) {
    if (!reference(items[i])) return false;
  }
  return true;
}

bool Writer::number(const PropertyValue& root) noexcept {
  root_ = root;
  if (!add_object(root.word())) return false;
  if (!root.is_container()) {
    body_size_ = leaf_size(root.word());
    return true;
  }
  std::size_t level_end = 1, depth = 1;
  for (std::size_t i = 0; i < object_count_; ++i) {
    if (i == level_end) {
      level_end = object_count_;
      ++depth;
    }
    if (kind_of(objects_[i]) < PropertyKind::array) continue;
    if (depth > kMaximumDepth) return false;
    if (!number_children(*static_cast<const ContainerNode*>(node_of(objects_[i])))) return false;
  }
  return true;
}

bool Writer::lay_out() noexcept {
  reference_size_ = format::integer_width(object_count_ - 1);
  table_offset_ = format::kHeader.size() + body_size_ + reference_count_ * reference_size_;
  offset_size_ = format::integer_width(table_offset_);
  const std::size_t size = table_offset_ + object_count_ * offset_size_ + format::kTrailerSize;
  const std::size_t before = out_.size();
  if (!out_.resize(before + size)) return false;
  start_ = out_.data() + before;
  return true;
}

void Writer::emit_bytes(std::string_view bytes) noexcept {
  if (!bytes.empty()) std::memcpy(at_, bytes.data(), bytes.size());
  at_ += bytes.size();
}

void Writer::emit_integer(std::uint64_t value, std::size_t width) noexcept {
  *at_++ = static_cast<std::byte>(format::kInteger << 4 | static_cast<unsigned>(std::countr_zero(width)));
  format::put_integer(at_, value, width);
  at_ += width;
}

void Writer::emit_marker(std::uint8_t kind, std::uint64_t size) noexcept {
  const std::uint64_t nibble = std::min<std::uint64_t>(size, format::kLongSize);
  *at_++ = static_cast<std::byte>(std::uint64_t{kind} << 4 | nibble);
  if (nibble == format::kLongSize) emit_integer(size, format::integer_width(size));
}

void Writer::emit_text(const BytesNode& text) noexcept {
  if ((text.flags & kAscii) != 0) {
    emit_marker(format::kAsciiText, text.length);
    emit_bytes(text.view());
  } else {
    emit_marker(format::kUtf16Text, utf16_units(text.view()));
    at_ = write_utf16(text.view(), at_);
  }
}

void Writer::emit_leaf(Word word) noexcept {
  const auto bits = [word] { return static_cast<const NumberNode*>(node_of(word))->bits; };
  switch (kind_of(word)) {
    case PropertyKind::boolean: *at_++ = static_cast<std::byte>(word == kTrue ? format::kTrue : format::kFalse); break;
    case PropertyKind::integer: {
      const std::size_t width = integer_object_width(word);
      const std::uint64_t value = is_node(word) ? bits() : static_cast<std::uint64_t>(immediate_value(word));
      if (width < 16) return emit_integer(value, width);
      *at_++ = static_cast<std::byte>(format::kInteger << 4 | 4);
      format::put_integer(at_, 0, 8);
      format::put_integer(at_ + 8, value, 8);
      at_ += 16;
      break;
    }
    case PropertyKind::real:
    case PropertyKind::date:
      *at_++ = static_cast<std::byte>(kind_of(word) == PropertyKind::date ? format::kDate : format::kReal << 4 | 3);
      format::put_integer(at_, bits(), 8);
      at_ += 8;
      break;
    case PropertyKind::data:
      emit_marker(format::kData, bytes_of(word)->length);
      emit_bytes(text_of(word));
      break;
    default: emit_text(*bytes_of(word));
  }
}

void Writer::emit_container(const ContainerNode& container) noexcept {
  const bool is_dictionary = container.kind == PropertyKind::dictionary;
  const std::size_t size = is_dictionary ? static_cast<const DictionaryNode&>(container).live : container.used;
  emit_marker(is_dictionary ? format::kDictionary : format::kArray, size);
  for (std::size_t left = is_dictionary ? size * 2 : size; left > 0; --left) {
    format::put_integer(at_, *next_reference_++, reference_size_);
    at_ += reference_size_;
  }
}

void Writer::emit_objects() noexcept {
  at_ = start_;
  emit_bytes(format::kHeader);
  next_reference_ = references_;
  std::byte* table = start_ + table_offset_;
  for (std::size_t i = 0; i < object_count_; ++i, table += offset_size_) {
    format::put_integer(table, static_cast<std::uint64_t>(at_ - start_), offset_size_);
    if (kind_of(objects_[i]) < PropertyKind::array) {
      emit_leaf(objects_[i]);
    } else {
      emit_container(*static_cast<const ContainerNode*>(node_of(objects_[i])));
    }
  }
}

void Writer::emit_trailer() noexcept {
  std::byte* trailer = start_ + table_offset_ + object_count_ * offset_size_;
  std::memset(trailer, 0, format::kTrailerSize);
  trailer[format::kOffsetSizeAt] = static_cast<std::byte>(offset_size_);
  trailer[format::kReferenceSizeAt] = static_cast<std::byte>(reference_size_);
  format::put_integer(trailer + format::kObjectCountAt, object_count_, 8);
  format::put_integer(trailer + format::kTableOffsetAt, table_offset_, 8);
}

}  // namespace

bool write_binary(const PropertyValue& value, ByteBuffer& out) noexcept {
  if (!value) return false;
  Writer writer(out);
  return writer.write(value);
}

}  // namespace quorvel
