// Reading happens in two passes over the objects. The first goes through the offset table in order, checks every object
// and makes every leaf; the second makes the containers from the top object down, children before their parents, with a
// stack of fixed size. Nothing is allocated for a number that the file merely claims.

#include <algorithm>
#include <cstdlib>
#include <memory>

#include "property/binary/binary.h"
#include "property/binary/leaf_reader.h"
#include "property/binary/object_walk.h"
#include "property/block_run.h"
#include "property/dictionary_index.h"
#include "property/growing_row.h"
#include "property/walk.h"

namespace quorvel {

namespace format = binary_format;
using namespace detail;

namespace {

using Object = EncodedObject;

class Reader {
 public:
  Reader(std::span<const std::byte> bytes, Mutability mutability) noexcept
      : bytes_(bytes), container_flags_(mutability == Mutability::mutable_containers ? std::uint8_t{kMutable} : 0) {}
  ~Reader();
  Reader(const Reader&) = delete;
  Reader& operator=(const Reader&) = delete;

  [[nodiscard]] PropertyValue read() noexcept;

  // The sink of the first pass.
  struct ShortRun {
    LeafAllocator::Room room;
    MadeWord* made;
    [[nodiscard]] bool has_room() const noexcept { return room.end - room.at >= kShortLeafRoom; }
    [[nodiscard]] Chunk take(std::uint64_t number, const ShortLeaf& leaf) noexcept {
      Chunk all;
      made[number] = make_short_leaf(leaf, room, all);
      return all;
    }
  };
  [[nodiscard]] ShortRun begin_run() const noexcept { return {leaves_.room(), made_}; }
  void end_run(const ShortRun& run) noexcept { leaves_.fill(run.room); }
  // All objects are compared before a leaf is made of one that stands out of order.
  [[nodiscard]] bool accept_disorder() const noexcept { return !objects_overlap(); }
  [[nodiscard]] bool add_leaf(std::uint64_t number, const Object& object, std::size_t length) noexcept {
    made_[number] = MadeWord::of_leaf(make_leaf(object, length, leaves_));
    return made_[number].bits != 0 && (!made_[number].has_own_count() || note_counted(number));
  }
  [[nodiscard]] bool add_container(std::uint64_t number, const Object&) noexcept {
    made_[number] = MadeWord::unmade();
    return note_counted(number);
  }

 private:
  using Run = BlockRun<TakeReferences>;
  // A container whose elements are being made.
  struct Visit {
    std::size_t object;
    std::uint64_t next;  // reference to look at
  };

  [[nodiscard]] bool objects_overlap() const noexcept;
  // Notes an object that has, or will have, a count of its own; releases it when memory runs out.
  [[nodiscard]] bool note_counted(std::uint64_t number) noexcept;
  void release_made(std::uint64_t number) const noexcept {
    if (made_[number].has_own_count()) release(made_[number].plain());
  }

  bool make_containers() noexcept;
  bool visit_children(Visit& visit, Visit* stack, std::size_t& depth) noexcept;
  bool make_container(const Object& object, MadeWord& made) noexcept;
  bool make_array(const Object& object, MadeWord& made) noexcept;
  bool make_dictionary(const Object& object, MadeWord& made) noexcept;
  void fill_dictionary(const Object& object, DictionaryNode& dictionary) noexcept;
  // The word of the object that the reference at `at` names, or 0 when there is no such object.
  [[nodiscard]] MadeWord made_at(const std::byte* at) const noexcept {
    const std::uint64_t index = layout_.reference_at(at);
    return index < layout_.count() ? made_[index] : MadeWord{};
  }
  // The word of an object, with a reference to it.
  Word take(MadeWord made, Run& run) noexcept;
  // Every container but the top one is made when its first reference is met. With more references than that, a walk
  // meets some containers again.
  [[nodiscard]] bool shares_containers() const noexcept { return container_references_ + 1 > containers_; }

  std::span<const std::byte> bytes_;
  std::uint8_t container_flags_;
  BinaryLayout layout_;
  LeafAllocator leaves_;
  MadeWord* made_ = nullptr;           // by the objects' numbers
  GrowingRow<std::uint64_t> counted_;  // the numbers of the objects that have counts of their own
  std::uint64_t containers_ = 0;
  std::uint64_t container_references_ = 0;
};

Reader::~Reader() {
  for (std::size_t i = 0; i < counted_.size(); ++i) release_made(counted_[i]);
  std::free(made_);
}

PropertyValue Reader::read() noexcept {
  if (!layout_.parse(bytes_)) return nullptr;
  made_ = static_cast<MadeWord*>(std::malloc(layout_.count() * sizeof(MadeWord)));
  if (made_ == nullptr) return nullptr;
  leaves_.start(bytes_.size());
  if (!walk_objects(layout_, *this) || !make_containers()) return nullptr;
  const Word top = made_[layout_.top()].plain();
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

bool Reader::note_counted(std::uint64_t number) noexcept {
  if (counted_.add(number)) return true;
  release_made(number);
  return false;
}

inline Word Reader::take(MadeWord made, Run& run) noexcept {
  const Word word = made.plain();
  if (made.has_own_count()) {
    container_references_ += node_of(word)->kind >= PropertyKind::array ? 1 : 0;
    retain(word);
  } else {
    run.add_masked(node_of(word), made.node_mask());
  }
  return word;
}

// Puts the next child that must be made first on the stack; without one, makes the container on top of it.
bool Reader::visit_children(Visit& visit, Visit* stack, std::size_t& depth) noexcept {
  Object object;
  if (!layout_.object_at(layout_.offset_of(visit.object), object)) return false;
  // Keys are texts, or refused when the dictionary is made: only its values can be containers.
  const std::uint64_t first = object.kind == format::kDictionary ? object.size : 0;
  const std::uint64_t references = first + object.size;
  visit.next = std::max(visit.next, first);
  for (; visit.next < references; ++visit.next) {
    const std::byte* at = object.body + visit.next * layout_.reference_size();
    const MadeWord made = made_at(at);
    if (made.bits == 0 || made == MadeWord::in_the_making()) return false;
    if (made == MadeWord::unmade()) {
      if (depth == kMaximumDepth) return false;
      stack[depth++] = {static_cast<std::size_t>(layout_.reference_at(at)), 0};
      made_[stack[depth - 1].object] = MadeWord::in_the_making();
      return true;
    }
  }
  --depth;
  return make_container(object, made_[visit.object]);
}

bool Reader::make_containers() noexcept {
  if (made_[layout_.top()] != MadeWord::unmade()) return true;
  Visit stack[kMaximumDepth];
  std::size_t depth = 1;
  stack[0] = {static_cast<std::size_t>(layout_.top()), 0};
  made_[layout_.top()] = MadeWord::in_the_making();
  while (depth > 0) {
    if (!visit_children(stack[depth - 1], stack, depth)) return false;
  }
  return true;
}

bool Reader::make_container(const Object& object, MadeWord& made) noexcept {
  ++containers_;
  return object.kind == format::kDictionary ? make_dictionary(object, made) : make_array(object, made);
}

bool Reader::make_array(const Object& object, MadeWord& made) noexcept {
  ArrayNode* array = new_array(object.size, container_flags_);
  if (array == nullptr) return false;
  made = {word_of(array)};
  const std::byte* at = object.body;
  Run run;
  for (std::uint64_t i = 0; i < object.size; ++i, at += layout_.reference_size()) {
    const MadeWord item = made_at(at);
    if (item.bits == 0) return false;
    array->items()[array->used++] = take(item, run);
  }
  return true;
}

bool Reader::make_dictionary(const Object& object, MadeWord& made) noexcept {
  // Keys differ, and so do their objects.
  if (object.size > layout_.count()) return false;
  DictionaryNode* dictionary = new_dictionary(object.size, container_flags_);
  if (dictionary == nullptr) return false;
  made = {word_of(dictionary)};
  if (!make_index(*dictionary, dictionary->capacity)) return false;
  fill_dictionary(object, *dictionary);
  return dictionary->used == dictionary->capacity;
}

// Fills in the entries, up to the first that is not sound.
void Reader::fill_dictionary(const Object& object, DictionaryNode& dictionary) noexcept {
  const BinaryLayout layout = layout_;
  const MadeWord* const made = made_;
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
    if (key_number >= layout.count() || value_number >= layout.count() || !made[key_number].is_text()) break;
    // Keys in ascending order are known to differ.
    const std::string_view text = text_of(made[key_number].plain());
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
