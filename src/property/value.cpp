#include "property/value.h"

#include <bit>
#include <cstring>
#include <limits>

#include "property/binary/format.h"
#include "property/unicode.h"

namespace quorvel {

using namespace detail;

namespace {

const PropertyValue kNone;

PropertyValue new_number(PropertyKind kind, std::uint64_t bits, std::size_t length = 8) noexcept {
  return PropertyValue::adopt(finish_number(new_bytes(kind, length, kVerbatim), bits));
}

std::uint64_t bits_of(const BytesNode& number) noexcept {
  return binary_format::get_integer(reinterpret_cast<const std::byte*>(number.bytes()) + number.length - 8, 8);
}

void copy_bytes(char* to, std::string_view from) noexcept {
  if (!from.empty()) std::memcpy(to, from.data(), from.size());
}

}  // namespace

PropertyValue PropertyValue::integer(std::int64_t value) noexcept {
  if (value >= kImmediateMinimum && value <= kImmediateMaximum) return adopt(immediate_integer(value));
  return new_number(PropertyKind::integer, static_cast<std::uint64_t>(value));
}

PropertyValue PropertyValue::unsigned_integer(std::uint64_t value) noexcept {
  if (value <= std::uint64_t{std::numeric_limits<std::int64_t>::max()}) {
    return integer(static_cast<std::int64_t>(value));
  }
  return new_number(PropertyKind::integer, value, 16);
}

PropertyValue PropertyValue::real(double value) noexcept {
  return new_number(PropertyKind::real, std::bit_cast<std::uint64_t>(value));
}

PropertyValue PropertyValue::date(double seconds) noexcept {
  return new_number(PropertyKind::date, std::bit_cast<std::uint64_t>(seconds));
}

PropertyValue PropertyValue::string(std::string_view utf8) noexcept {
  const TextCheck check = check_utf8(utf8);
  if (check == TextCheck::invalid) return nullptr;
  BytesNode* node = new_bytes(PropertyKind::string, utf8.size(), check == TextCheck::ascii ? kVerbatim : 0);
  if (node != nullptr) copy_bytes(node->bytes(), utf8);
  return adopt(word_of(node));
}

PropertyValue PropertyValue::joined_string(std::string_view head, std::string_view tail) noexcept {
  const bool ascii = is_ascii(head) && is_ascii(tail);
  BytesNode* node = new_bytes(PropertyKind::string, head.size() + tail.size(), ascii ? kVerbatim : 0);
  if (node != nullptr) {
    copy_bytes(node->bytes(), head);
    copy_bytes(node->bytes() + head.size(), tail);
  }
  return adopt(word_of(node));
}

PropertyValue PropertyValue::data(std::span<const std::byte> bytes) noexcept {
  BytesNode* node = new_bytes(PropertyKind::data, bytes.size(), kVerbatim);
  if (node != nullptr) copy_bytes(node->bytes(), {reinterpret_cast<const char*>(bytes.data()), bytes.size()});
  return adopt(word_of(node));
}

PropertyValue PropertyValue::array(std::size_t expected) noexcept {
  return adopt(word_of(new_array(expected, kMutable)));
}

PropertyValue PropertyValue::dictionary(std::size_t expected) noexcept {
  return adopt(word_of(new_dictionary(expected, kMutable)));
}

std::optional<std::int64_t> PropertyValue::wide_to_int64() const noexcept {
  if (!is_node(word_) || kind() != PropertyKind::integer) return std::nullopt;
  const BytesNode& number = *bytes_of(word_);
  if (number.length > 8) return std::nullopt;
  return static_cast<std::int64_t>(bits_of(number));
}

std::optional<std::uint64_t> PropertyValue::to_uint64() const noexcept {
  if (kind() != PropertyKind::integer) return std::nullopt;
  if (is_node(word_) && bytes_of(word_)->length > 8) return bits_of(*bytes_of(word_));
  const std::int64_t value = *to_int64();
  if (value < 0) return std::nullopt;
  return static_cast<std::uint64_t>(value);
}

double PropertyValue::to_double() const noexcept {
  if (kind() != PropertyKind::real && kind() != PropertyKind::date) return 0;
  return std::bit_cast<double>(bits_of(*bytes_of(word_)));
}

std::span<const std::byte> PropertyValue::bytes() const noexcept {
  if (kind() != PropertyKind::data) return {};
  return std::as_bytes(std::span(bytes_of(word_)->bytes(), bytes_of(word_)->length));
}

std::span<std::byte> PropertyValue::mutable_bytes() noexcept {
  if (!make_unique(PropertyKind::data)) return {};
  auto* node = static_cast<BytesNode*>(node_of(word_));
  return std::as_writable_bytes(std::span(node->bytes(), node->length));
}

std::size_t PropertyValue::size() const noexcept {
  if (kind() == PropertyKind::array) return static_cast<const ArrayNode*>(node_of(word_))->used;
  if (kind() == PropertyKind::dictionary) return dictionary_at(word_).live;
  return 0;
}

const PropertyValue& PropertyValue::at(std::size_t index) const noexcept {
  if (kind() != PropertyKind::array || index >= size()) return kNone;
  return borrowed(static_cast<const ArrayNode*>(node_of(word_))->items()[index]);
}

bool PropertyValue::append(PropertyValue value) noexcept {
  if (!value || !make_unique(PropertyKind::array)) return false;
  auto* array = static_cast<ArrayNode*>(node_of(word_));
  if (array->used == array->capacity && !grow_storage(*array, sizeof(Word))) return false;
  array->items()[array->used++] = value.take();
  return true;
}

PropertyValue* PropertyValue::slot(std::size_t index) noexcept {
  if (kind() != PropertyKind::array || index >= size() || !make_unique(PropertyKind::array)) return nullptr;
  return reinterpret_cast<PropertyValue*>(&static_cast<ArrayNode*>(node_of(word_))->items()[index]);
}

PropertyValue PropertyValue::mutable_copy() const noexcept {
  switch (kind()) {
    case PropertyKind::dictionary: return adopt(word_of(copy_dictionary(dictionary_at(word_))));
    case PropertyKind::array: {
      const auto* from = static_cast<const ArrayNode*>(node_of(word_));
      ArrayNode* copy = new_array(from->used, kMutable);
      if (copy == nullptr) return nullptr;
      copy->used = from->used;
      if (from->used > 0) std::memcpy(copy->items(), from->items(), from->used * sizeof(Word));
      retain_all(copy->items(), copy->used);
      return adopt(word_of(copy));
    }
    case PropertyKind::data: {
      PropertyValue copy = data(bytes());
      if (copy) node_of(copy.word_)->flags |= kMutable;
      return copy;
    }
    default: return nullptr;
  }
}

bool PropertyValue::make_unique(PropertyKind wanted) noexcept {
  if (kind() != wanted || !is_mutable()) return false;
  // Acquire: whoever else held it is done with it before it changes.
  if (node_of(word_)->count.load(std::memory_order_acquire) == 1) return true;
  PropertyValue copy = mutable_copy();
  if (!copy) return false;
  std::swap(word_, copy.word_);
  return true;
}

}  // namespace quorvel
