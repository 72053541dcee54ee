// Reading happens in two passes over the objects. The first goes through the offset table in order, checks every object
// and makes every leaf; the second makes the containers from the top object down, children before their parents, with a
// stack of fixed size. Nothing is allocated for a number that the file merely claims.

#include <algorithm>
#include <cstdlib>
#include <memory>

#include "property/binary/binary.h"
#include "property/binary/leaf_reader.h"
#include "property/binary/short_text.h"
#include "property/block_run.h"
#include "property/dictionary_index.h"
#include "property/walk.h"

namespace quorvel {

namespace format = binary_format;
using namespace detail;

namespace {

// What stands for a container that is not made yet, or being made. Never retained, never handed out.
constexpr Word kUnmade = 5;
constexpr Word kInTheMaking = 5 | 8;

bool is_text(Word made) noexcept { return (made & (kImmediateBit | kTextTag)) == kTextTag; }
bool has_own_count(Word made) noexcept { return (made & (kImmediateBit | kBlockTag)) == 0; }
Word plain_word(Word made) noexcept {
  const Word is_node = (made & kImmediateBit) - 1;
  return made & ~(is_node & (kBlockTag | kTextTag));
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
  bool make_short_leaves(std::uint64_t& end) noexcept;
  bool objects_overlap() const noexcept;
  // Notes an object that has, or will have, a count of its own; releases it when memory runs out.
  bool note_counted(std::uint64_t number) noexcept;
  void release_made(std::uint64_t number) const noexcept {
    if (has_own_count(made_[number])) release(plain_word(made_[number]));
  }

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
  std::uint64_t* counted_ = nullptr;  // the numbers of the objects that have counts of their own
  std::size_t counted_count_ = 0;
  std::size_t counted_room_ = 0;
  std::uint64_t containers_ = 0;
  std::uint64_t container_references_ = 0;
};

Reader::~Reader() {
  for (std::size_t i = 0; i < counted_count_; ++i) release_made(counted_[i]);
  std::free(counted_);
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
    first[i] = {offset, layout_.offset_at(object.end)};
  }
  std::sort(first, first + layout_.count(), [](const Extent& a, const Extent& b) { return a.begin < b.begin; });
  for (std::size_t i = 1; i < layout_.count(); ++i) {
    if (first[i].begin < first[i - 1].end) return true;
  }
  return false;
}

// Makes short leaves, one behind the other from the first object on that has no word yet, as long as each stands behind
// the one before; `end` is where the last object ended. False when a text is none.
bool Reader::make_short_leaves(std::uint64_t& end) noexcept {
  // Bytes that are written may be anything's, to the compiler: what it must not read again is copied.
  const BinaryLayout layout = layout_;
  LeafAllocator::Room room = leaves_.room();
  Word* const made = made_;
  const std::uint64_t limit = layout.limit_of(kLargestShortObject);
  std::uint64_t behind = end, i = made_count_;
  Word word = kUnmade;
  for (; i < layout.count() && room.end - room.at >= kShortLeafRoom; ++i) {
    const std::uint64_t offset = layout.offset_of(i);
    if (offset < behind || offset >= limit) break;
    ShortLeaf leaf;
    if (!find_short_leaf(layout.at(offset), leaf)) break;
    word = make_short_leaf(leaf, room);
    if (word == 0) break;
    made[i] = word;
    behind = layout.offset_at(leaf.body + leaf.size);
  }
  leaves_.fill(room);
  made_count_ = i;
  end = behind;
  return word != 0;
}

bool Reader::note_counted(std::uint64_t number) noexcept {
  if (counted_count_ == counted_room_) {
    const std::size_t larger = std::max<std::size_t>(16, counted_room_ * 2);
    void* grown = std::realloc(counted_, larger * sizeof *counted_);
    if (grown == nullptr) {
      release_made(number);
      return false;
    }
    counted_ = static_cast<std::uint64_t*>(grown);
    counted_room_ = larger;
  }
  counted_[counted_count_++] = number;
  return true;
}

bool Reader::make_leaves() noexcept {
  bool may_overlap = true;  // until it is known that nothing does
  std::uint64_t end = format::kHeader.size();
  while (made_count_ < layout_.count()) {
    if (!make_short_leaves(end)) return false;
    if (made_count_ == layout_.count()) return true;
    Object object;
    const std::uint64_t offset = layout_.offset_of(made_count_);
    if (!layout_.object_at(offset, object)) return false;
    // Objects that stand in the order of their numbers are compared one by one; the first that does not has all of
    // them compared, before a leaf is made of it.
    if (may_overlap && offset < end) {
      if (objects_overlap()) return false;
      may_overlap = false;
    }
    end = layout_.offset_at(object.end);
    const Word made = object.is_container() ? kUnmade : tagged_leaf(make_leaf(object, leaves_));
    if (made == 0) return false;
    made_[made_count_++] = made;
    if ((object.is_container() || has_own_count(made)) && !note_counted(made_count_ - 1)) return false;
  }
  return true;
}

inline Word Reader::take(Word made, Run& run) noexcept {
  const Word word = plain_word(made);
  if (has_own_count(made)) {
    container_references_ += node_of(word)->kind >= PropertyKind::array ? 1 : 0;
    retain(word);
  } else {
    run.add_masked(node_of(word), (made & kImmediateBit) - 1);
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
  const BinaryLayout layout = layout_;
  const Word* const made = made_;
  Entry* const entries = dictionary.entries();
  const std::byte* at = object.body;
  const std::byte* values = object.body + object.size * layout.reference_size();
  std::string_view before;
  Run keys_run, values_run;
  IndexFiller index(dictionary);
  bool ascends = true;
  std::uint32_t i = 0;
  for (const std::uint32_t size = dictionary.capacity; i < size; ++i) {
    const std::uint64_t key_number = layout.reference_at(at), value_number = layout.reference_at(values);
    if (key_number >= layout.count() || value_number >= layout.count() || !is_text(made[key_number])) break;
    // Keys in ascending order are known to differ.
    const std::string_view text = text_of(plain_word(made[key_number]));
    ascends = ascends && (i == 0 || stands_before(before, text));
    if (!ascends) dictionary.used = i;
    if (!index.add(text, !ascends)) break;
    entries[i] = {take(made[key_number], keys_run), take(made[value_number], values_run)};
    if (ascends) dictionary.ascending = i + 1;
    before = text;
    at += layout.reference_size();
    values += layout.reference_size();
  }
  dictionary.used = dictionary.live = i;
}

}  // namespace

PropertyValue read_binary(std::span<const std::byte> bytes, Mutability mutability) noexcept {
  Reader reader(bytes, mutability);
  return reader.read();
}

}  // namespace quorvel
