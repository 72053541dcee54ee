// Reading happens in two passes over the objects. The first goes through the offset table in order, checks every object
// and makes every leaf; the second makes the containers from the top object down, children before their parents, with a
// stack of fixed size. Nothing is allocated for a number that the file merely claims.

#include <algorithm>
#include <bit>
#include <cstdlib>
#include <cstring>
#include <memory>

#include "platform/property/binary.h"
#include "platform/property/binary_layout.h"
#include "platform/property/leaf_allocator.h"
#include "platform/property/unicode.h"
#include "platform/property/walk.h"

namespace quorvel {

namespace format = binary_format;
using namespace detail;

namespace {

// What stands for a container that is not made yet, or being made. Never retained, never handed out.
constexpr Word kUnmade = 5;
constexpr Word kInTheMaking = 5 | 8;

using Object = EncodedObject;

class Reader {
 public:
  Reader(std::span<const std::byte> bytes, Mutability mutability) noexcept
      : bytes_(bytes), container_flags_(mutability == Mutability::mutable_containers ? std::uint8_t{kMutable} : 0) {}
  ~Reader();
  Reader(const Reader&) = delete;
  Reader& operator=(const Reader&) = delete;

  [[nodiscard]] PropertyValue read() noexcept;

 private:
  struct Frame {
    std::size_t object;
    std::uint64_t next;  // reference to look at
  };

  bool make_leaves() noexcept;
  bool make_leaf(const Object& object, Word& word) noexcept;
  bool make_integer(const Object& object, Word& word) noexcept;
  bool make_text(const Object& object, Word& word) noexcept;
  bool objects_overlap() const noexcept;

  bool make_containers() noexcept;
  bool visit_children(Frame& frame, Frame* stack, std::size_t& depth) noexcept;
  bool make_container(const Object& object, Word& word) noexcept;
  bool make_dictionary(const Object& object, Word& word) noexcept;
  bool take_reference(const std::byte* at, Word& word) const noexcept;
  void count_container(Word word) noexcept { container_references_ += kind_of(word) >= PropertyKind::array ? 1 : 0; }
  // Each container but the top one is made for its first reference: when there are more, a walk meets some again.
  [[nodiscard]] bool shares_containers() const noexcept { return container_references_ + 1 > containers_; }

  std::span<const std::byte> bytes_;
  std::uint8_t container_flags_;
  BinaryLayout layout_;
  LeafAllocator leaves_;
  Word* words_ = nullptr;
  std::uint64_t containers_ = 0;
  std::uint64_t container_references_ = 0;
};

Reader::~Reader() {
  if (words_ == nullptr) return;
  for (std::uint64_t i = 0; i < layout_.count(); ++i) {
    if (is_node(words_[i]) && (node_of(words_[i])->flags & kInBlock) == 0) release(words_[i]);
  }
  std::free(words_);
}

PropertyValue Reader::read() noexcept {
  if (!layout_.parse(bytes_)) return nullptr;
  words_ = static_cast<Word*>(std::calloc(layout_.count(), sizeof(Word)));
  if (words_ == nullptr) return nullptr;
  leaves_.start(bytes_.size());
  if (!make_leaves() || !make_containers()) return nullptr;
  retain(words_[layout_.top()]);
  PropertyValue value = PropertyValue::adopt(words_[layout_.top()]);
  if (shares_containers() && !is_within_limits(value)) return nullptr;
  return value;
}

// Two objects that share bytes would let a small file stand for large values.
bool Reader::objects_overlap() const noexcept {
  struct Extent {
    std::uint64_t begin;
    std::uint64_t end;
  };
  const std::unique_ptr<Extent, decltype(&std::free)> extents(
      static_cast<Extent*>(std::malloc(layout_.count() * sizeof(Extent))), &std::free);
  if (extents == nullptr) return true;
  Extent* const first = extents.get();
  for (std::size_t i = 0; i < layout_.count(); ++i) {
    Object object;
    const std::uint64_t offset = layout_.offset_of(i);
    if (!layout_.object_at(offset, object)) return true;
    first[i] = {offset, layout_.end_of(object)};
  }
  std::sort(first, first + layout_.count(), [](const Extent& a, const Extent& b) { return a.begin < b.begin; });
  for (std::size_t i = 1; i < layout_.count(); ++i) {
    if (first[i].begin < first[i - 1].end) return true;
  }
  return false;
}

bool Reader::make_leaves() noexcept {
  bool may_overlap = true;  // until it is known that nothing does
  std::uint64_t end = 0;
  for (std::size_t i = 0; i < layout_.count(); ++i) {
    Object object;
    const std::uint64_t offset = layout_.offset_of(i);
    if (!layout_.object_at(offset, object)) return false;
    // Objects that stand in the order of their numbers are compared one by one; the first that does not has all of
    // them compared, before a leaf is made of it.
    if (may_overlap && offset < end) {
      if (objects_overlap()) return false;
      may_overlap = false;
    }
    end = layout_.end_of(object);
    if (object.is_container()) {
      words_[i] = kUnmade;
    } else if (!make_leaf(object, words_[i])) {
      return false;
    }
  }
  return true;
}

bool Reader::make_integer(const Object& object, Word& word) noexcept {
  std::uint64_t value = 0;
  bool is_unsigned = object.size < 8;
  if (object.size <= 8) {
    value = format::get_integer(object.body, object.size);
  } else {
    if (!fits_64_bits(object)) return false;
    is_unsigned = *object.body == std::byte{0};
    value = format::get_integer(object.body + 8, 8);
  }
  if (!is_unsigned || value >> 63 == 0) {
    const auto number = static_cast<std::int64_t>(value);
    if (number >= kImmediateMinimum && number <= kImmediateMaximum) {
      word = immediate_integer(number);
      return true;
    }
  }
  const bool is_large = is_unsigned && value >> 63 != 0;
  word = leaves_.add_number(PropertyKind::integer, value, is_large ? std::uint8_t{kUnsigned} : 0);
  return word != 0;
}

bool Reader::make_text(const Object& object, Word& word) noexcept {
  if (object.kind == format::kUtf16Text) {
    const std::size_t length = utf8_length_of_utf16(object.body, object.size);
    if (length == SIZE_MAX) return false;
    // A text that ASCII could have held is marked as what it is, so that it is written as such.
    BytesNode* node = leaves_.add_bytes(PropertyKind::string, length, length == object.size ? std::uint8_t{kAscii} : 0);
    if (node == nullptr) return false;
    write_utf8(object.body, object.size, node->bytes());
    word = word_of(node);
    return true;
  }
  const std::string_view text(reinterpret_cast<const char*>(object.body), object.size);
  const bool is_text = object.kind == format::kAsciiText;
  if (is_text && !is_ascii(text)) return false;
  BytesNode* node = leaves_.add_bytes(is_text ? PropertyKind::string : PropertyKind::data, text.size(),
                                      is_text ? std::uint8_t{kAscii} : 0);
  if (node == nullptr) return false;
  if (!text.empty()) std::memcpy(node->bytes(), text.data(), text.size());
  word = word_of(node);
  return true;
}

bool Reader::make_leaf(const Object& object, Word& word) noexcept {
  switch (object.kind) {
    case format::kFalse >> 4: word = object.nibble == (format::kTrue & 15) ? kTrue : kFalse; return true;
    case format::kInteger: return make_integer(object, word);
    case format::kReal:
    case format::kDate >> 4: {
      std::uint64_t bits = format::get_integer(object.body, object.size);
      if (object.size == 4) {
        bits = std::bit_cast<std::uint64_t>(double{std::bit_cast<float>(static_cast<std::uint32_t>(bits))});
      }
      word = leaves_.add_number(object.kind == format::kReal ? PropertyKind::real : PropertyKind::date, bits, 0);
      return word != 0;
    }
    default: return make_text(object, word);
  }
}

bool Reader::take_reference(const std::byte* at, Word& word) const noexcept {
  const std::uint64_t index = layout_.reference_at(at);
  if (index >= layout_.count()) return false;
  word = words_[index];
  return true;
}

// Puts the next child that must be made first on the stack; without one, makes the container on top of it.
bool Reader::visit_children(Frame& frame, Frame* stack, std::size_t& depth) noexcept {
  Object object;
  if (!layout_.object_at(layout_.offset_of(frame.object), object)) return false;
  // Keys are texts, or refused when the dictionary is made: only its values can be containers.
  const std::uint64_t first = object.kind == format::kDictionary ? object.size : 0;
  const std::uint64_t references = first + object.size;
  frame.next = std::max(frame.next, first);
  for (; frame.next < references; ++frame.next) {
    const std::byte* at = object.body + frame.next * layout_.reference_size();
    Word word = 0;
    if (!take_reference(at, word) || word == kInTheMaking) return false;
    if (word == kUnmade) {
      if (depth == kMaximumDepth) return false;
      stack[depth++] = {static_cast<std::size_t>(layout_.reference_at(at)), 0};
      words_[stack[depth - 1].object] = kInTheMaking;
      return true;
    }
  }
  --depth;
  return make_container(object, words_[frame.object]);
}

bool Reader::make_containers() noexcept {
  if (words_[layout_.top()] != kUnmade) return true;
  Frame stack[kMaximumDepth];
  std::size_t depth = 1;
  stack[0] = {static_cast<std::size_t>(layout_.top()), 0};
  words_[layout_.top()] = kInTheMaking;
  while (depth > 0) {
    if (!visit_children(stack[depth - 1], stack, depth)) return false;
  }
  return true;
}

bool Reader::make_container(const Object& object, Word& word) noexcept {
  ++containers_;
  if (object.kind == format::kDictionary) return make_dictionary(object, word);
  ArrayNode* array = new_array(object.size, container_flags_);
  if (array == nullptr) return false;
  word = word_of(array);
  for (std::uint64_t i = 0; i < object.size; ++i) {
    Word item = 0;
    if (!take_reference(object.body + i * layout_.reference_size(), item)) return false;
    count_container(item);
    array->items()[i] = item;
  }
  retain_all(array->items(), object.size);
  array->used = array->capacity;
  return true;
}

bool Reader::make_dictionary(const Object& object, Word& word) noexcept {
  DictionaryNode* dictionary = new_dictionary(object.size, container_flags_);
  if (dictionary == nullptr) return false;
  word = word_of(dictionary);
  Entry* const entries = dictionary->entries();
  const std::byte* at = object.body;
  const std::byte* values = object.body + object.size * layout_.reference_size();
  std::string_view before;
  std::uint32_t ascending = 0;
  for (std::uint64_t i = 0; i < object.size; ++i, at += layout_.reference_size(), values += layout_.reference_size()) {
    Word key = 0, value = 0;
    if (!take_reference(at, key) || !take_reference(values, value)) return false;
    if (kind_of(key) != PropertyKind::string) return false;
    count_container(value);
    entries[i] = {key, value};
    if (ascending == i && (i == 0 || before < text_of(key))) ++ascending;
    before = text_of(key);
  }
  retain_all(&entries->key, object.size * 2);
  dictionary->used = dictionary->live = dictionary->capacity;
  dictionary->ascending = ascending;
  // Keys in ascending order are known to differ.
  return index_entries(*dictionary, ascending < dictionary->used);
}

}  // namespace

PropertyValue read_binary(std::span<const std::byte> bytes, Mutability mutability) noexcept {
  Reader reader(bytes, mutability);
  return reader.read();
}

}  // namespace quorvel
