// Reading happens in two passes over the objects. The first goes through the offset table in order, checks every object
// and makes every leaf; the second makes the containers from the top object down, children before their parents, with a
// stack of fixed size. Nothing is allocated for a number that the file merely claims.

#include <algorithm>
#include <cstdlib>
#include <memory>

#include "platform/property/binary.h"
#include "platform/property/block_run.h"
#include "platform/property/dictionary_index.h"
#include "platform/property/leaf_reader.h"
#include "platform/property/short_text.h"
#include "platform/property/walk.h"

namespace quorvel {

namespace format = binary_format;
using namespace detail;

namespace {

// What the table of objects holds is a word, and for a node what a container needs to know of it: many files are larger
// than the processor's caches, and a node that was just made is already far away.
constexpr Word kBlockTag = 2;  // a leaf in a block
constexpr Word kTextTag = 4;
// What stands for a container that is not made yet, or being made. Never retained, never handed out.
constexpr Word kUnmade = 5;
constexpr Word kInTheMaking = 5 | 8;

bool is_immediate(Word made) noexcept { return (made & kImmediateBit) != 0; }
bool is_text(Word made) noexcept { return (made & (kImmediateBit | kTextTag)) == kTextTag; }
bool is_in_block(Word made) noexcept { return (made & (kImmediateBit | kBlockTag)) == kBlockTag; }
Word plain_word(Word made) noexcept { return is_immediate(made) ? made : made & ~(kBlockTag | kTextTag); }
Word tagged_leaf(Word word) noexcept {
  if (!is_node(word)) return word;
  const Node& node = *node_of(word);
  return word | ((node.flags & kInBlock) != 0 ? kBlockTag : 0) | (node.kind == PropertyKind::string ? kTextTag : 0);
}

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
  using Run = BlockRun<TakeReferences>;
  struct Frame {
    std::size_t object;
    std::uint64_t next;  // reference to look at
  };

  bool make_leaves() noexcept;
  bool objects_overlap() const noexcept;

  bool make_containers() noexcept;
  bool visit_children(Frame& frame, Frame* stack, std::size_t& depth) noexcept;
  bool make_container(const Object& object, Word& made) noexcept;
  bool make_array(const Object& object, Word& made) noexcept;
  bool make_dictionary(const Object& object, Word& made) noexcept;
  void fill_dictionary(const Object& object, DictionaryNode& dictionary) noexcept;
  // What is referred to at `at`, or 0.
  [[nodiscard]] Word made_at(const std::byte* at) const noexcept {
    const std::uint64_t index = layout_.reference_at(at);
    return index < layout_.count() ? made_[index] : 0;
  }
  // The word of an object, with a reference to it.
  Word take(Word made, Run& run) noexcept;
  // Each container but the top one is made for its first reference: when there are more, a walk meets some again.
  [[nodiscard]] bool shares_containers() const noexcept { return container_references_ + 1 > containers_; }

  std::span<const std::byte> bytes_;
  std::uint8_t container_flags_;
  BinaryLayout layout_;
  LeafAllocator leaves_;
  Word* made_ = nullptr;  // by the objects' numbers
  std::uint64_t made_count_ = 0;
  std::uint64_t containers_ = 0;
  std::uint64_t container_references_ = 0;
};

Reader::~Reader() {
  for (std::uint64_t i = 0; i < made_count_; ++i) {
    if (!is_immediate(made_[i]) && !is_in_block(made_[i])) release(plain_word(made_[i]));
  }
  std::free(made_);
}

PropertyValue Reader::read() noexcept {
  if (!layout_.parse(bytes_)) return nullptr;
  made_ = static_cast<Word*>(std::malloc(layout_.count() * sizeof(Word)));
  if (made_ == nullptr) return nullptr;
  leaves_.start(bytes_.size());
  if (!make_leaves() || !make_containers()) return nullptr;
  const Word top = plain_word(made_[layout_.top()]);
  retain(top);
  PropertyValue value = PropertyValue::adopt(top);
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
    const Word word = object.is_container() ? kUnmade : make_leaf(object, leaves_);
    if (word == 0) return false;
    made_[made_count_++] = tagged_leaf(word);
  }
  return true;
}

inline Word Reader::take(Word made, Run& run) noexcept {
  const Word word = plain_word(made);
  if (is_in_block(made)) {
    run.add(node_of(word));
  } else if (!is_immediate(made)) {
    container_references_ += node_of(word)->kind >= PropertyKind::array ? 1 : 0;
    retain(word);
  }
  return word;
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
    const Word made = made_at(at);
    if (made == 0 || made == kInTheMaking) return false;
    if (made == kUnmade) {
      if (depth == kMaximumDepth) return false;
      stack[depth++] = {static_cast<std::size_t>(layout_.reference_at(at)), 0};
      made_[stack[depth - 1].object] = kInTheMaking;
      return true;
    }
  }
  --depth;
  return make_container(object, made_[frame.object]);
}

bool Reader::make_containers() noexcept {
  if (made_[layout_.top()] != kUnmade) return true;
  Frame stack[kMaximumDepth];
  std::size_t depth = 1;
  stack[0] = {static_cast<std::size_t>(layout_.top()), 0};
  made_[layout_.top()] = kInTheMaking;
  while (depth > 0) {
    if (!visit_children(stack[depth - 1], stack, depth)) return false;
  }
  return true;
}

bool Reader::make_container(const Object& object, Word& made) noexcept {
  ++containers_;
  return object.kind == format::kDictionary ? make_dictionary(object, made) : make_array(object, made);
}

bool Reader::make_array(const Object& object, Word& made) noexcept {
  ArrayNode* array = new_array(object.size, container_flags_);
  if (array == nullptr) return false;
  made = word_of(array);
  const std::byte* at = object.body;
  Run run;
  for (std::uint64_t i = 0; i < object.size; ++i, at += layout_.reference_size()) {
    const Word item = made_at(at);
    if (item == 0) return false;
    array->items()[array->used++] = take(item, run);
  }
  return true;
}

bool Reader::make_dictionary(const Object& object, Word& made) noexcept {
  // Keys differ, and so do their objects.
  if (object.size > layout_.count()) return false;
  DictionaryNode* dictionary = new_dictionary(object.size, container_flags_);
  if (dictionary == nullptr) return false;
  made = word_of(dictionary);
  if (!make_index(*dictionary, dictionary->capacity)) return false;
  fill_dictionary(object, *dictionary);
  return dictionary->used == dictionary->capacity;
}

// Takes the entries in use, all of them or those up to the first that is not sound.
void Reader::fill_dictionary(const Object& object, DictionaryNode& dictionary) noexcept {
  Entry* const entries = dictionary.entries();
  const std::byte* at = object.body;
  const std::byte* values = object.body + object.size * layout_.reference_size();
  std::string_view before;
  Run keys_run, values_run;
  IndexFiller index(dictionary);
  for (std::uint32_t& i = dictionary.used; i < dictionary.capacity; ++i) {
    const Word key = made_at(at), value = made_at(values);
    if (value == 0 || !is_text(key)) break;
    // Keys in ascending order are known to differ.
    const std::string_view text = text_of(plain_word(key));
    const bool ascends = dictionary.ascending == i && (i == 0 || stands_before(before, text));
    if (!index.add(text, !ascends)) break;
    entries[i] = {take(key, keys_run), take(value, values_run)};
    dictionary.ascending += ascends ? 1 : 0;
    before = text;
    at += layout_.reference_size();
    values += layout_.reference_size();
  }
  dictionary.live = dictionary.used;
}

}  // namespace

PropertyValue read_binary(std::span<const std::byte> bytes, Mutability mutability) noexcept {
  Reader reader(bytes, mutability);
  return reader.read();
}

}  // namespace quorvel
