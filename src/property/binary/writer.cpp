// Writing happens in one pass, breadth first: a container is followed by its elements, those by theirs. Its references
// are left open where it stands, and filled in when its turn comes and its elements get their numbers. Only the size of
// a reference has to be guessed; when the guess turns out wrong, the value is written anew with the right one.

#include <algorithm>
#include <cstdlib>
#include <cstring>

#include "property/binary/binary.h"
#include "property/binary/leaf_table.h"
#include "property/binary/leaf_writer.h"
#include "property/binary/sorted_entries.h"
#include "property/walk.h"

namespace quorvel {

namespace format = binary_format;
using namespace detail;

namespace {

// Offsets are kept in four bytes while a file is written.
constexpr std::size_t kLargestFile = UINT32_MAX;
constexpr std::size_t kMaximumObjects = 0xffff'fffe;
constexpr std::size_t kLargestReference = 4;

// Looking every leaf up, to store equal ones once, costs more than all the rest of the writing, so it is done where
// leaves repeat: each leaf that is looked up spends one from a credit, and each that was there before earns some. A
// container with more than `kCredit` elements starts with a full one, so that whatever stands in a small file is looked
// up.
constexpr std::uint32_t kCredit = 256;
constexpr std::uint32_t kEarned = 4;
constexpr std::uint32_t kMaximumCredit = 4096;

// In ascending order of their keys, entries lie anywhere in memory: what is needed so many entries later is fetched
// meanwhile.
constexpr std::size_t kFetchAhead = 16;

// The room that an element takes in common files; a wrong guess costs another allocation. No more than so much is asked
// for on a guess: what many small elements do not need must not be what memory runs out for.
constexpr std::size_t kLikelyElementRoom = 72;
constexpr std::size_t kLargestGuess = std::size_t{4} << 20;

inline void fetch(Word word) noexcept {
  if (is_node(word)) __builtin_prefetch(node_of(word));
}

void fetch_elements(const ContainerNode& container) noexcept {
  const auto* words = static_cast<const Word*>(container.storage);
  const std::size_t count = container.kind == PropertyKind::dictionary ? container.used * 2 : container.used;
  for (std::size_t i = 0; i < std::min(count, kFetchAhead); ++i) fetch(words[i]);
}

// Entries that were removed do not count: equal values give equal bytes.
std::size_t element_count(const ContainerNode& container) noexcept {
  return container.kind == PropertyKind::dictionary ? static_cast<const DictionaryNode&>(container).live
                                                    : container.used;
}

// The keys, or the values, of a dictionary in their order.
template <Word Entry::*part>
class EntryRow {
 public:
  static constexpr bool kHasOnlyTexts = part == &Entry::key;
  explicit EntryRow(const SortedEntries& sorted) noexcept
      : entries_(sorted.entries()), order_(sorted.order()), size_(sorted.size()) {}
  [[nodiscard]] std::size_t size() const noexcept { return size_; }
  [[nodiscard]] Word operator[](std::size_t index) const noexcept {
    const std::size_t ahead = index + kFetchAhead < size_ ? index + kFetchAhead : index;
    if (order_ == nullptr) {
      __builtin_prefetch(node_of(entries_[ahead].*part));
      return entries_[index].*part;
    }
    __builtin_prefetch(node_of(entries_[order_[ahead]].*part));
    return entries_[order_[index]].*part;
  }

 private:
  const Entry* entries_;
  const std::uint32_t* order_;
  std::size_t size_;
};

// The elements of an array.
class ElementRow {
 public:
  static constexpr bool kHasOnlyTexts = false;
  explicit ElementRow(const ArrayNode& array) noexcept : array_(array) {}
  [[nodiscard]] std::size_t size() const noexcept { return array_.used; }
  [[nodiscard]] Word operator[](std::size_t index) const noexcept { return array_.items()[index]; }

 private:
  const ArrayNode& array_;
};

// Puts the objects of one value behind what the buffer holds. Every function that takes `at`, where the next byte goes,
// returns where it ended, or null when it failed.
class Writer {
 public:
  Writer(const PropertyValue& root, const OmittedEntries& omitted, ByteBuffer& out, std::size_t reference_size) noexcept
      : root_(root),
        omitted_(omitted),
        out_(out),
        before_(out.size()),
        reference_size_(reference_size),
        maximum_count_(std::min(kMaximumObjects, std::size_t{1} << (8 * reference_size))) {}
  Writer(const Writer&) = delete;
  Writer& operator=(const Writer&) = delete;
  ~Writer() {
    std::free(offsets_);
    std::free(queue_);
  }

  /// False when the value breaks a bound, memory runs out, or there are more objects than references can tell.
  [[nodiscard]] bool put_objects() noexcept;
  [[nodiscard]] bool has_too_many() const noexcept { return has_too_many_; }
  [[nodiscard]] std::size_t count() const noexcept { return count_; }
  /// Puts the offset table and the trailer, and makes all of it part of the buffer.
  [[nodiscard]] bool finish() noexcept;

 private:
  struct Queued {
    const ContainerNode* container;
    std::uint32_t references;  // where they are
  };

  std::byte* put_object(std::byte* at, Word word) noexcept;
  std::byte* put_container(std::byte* at, Word word) noexcept;
  std::byte* put_new_leaf(std::byte* at, Word word) noexcept;
  std::byte* add_boolean(std::byte* at, Word word) noexcept;
  std::byte* add_leaf(std::byte* at, Word word, std::uint32_t& credit) noexcept;
  std::byte* add_value(std::byte* at, Word word, std::uint32_t& credit) noexcept;
  template <class Row>
  std::byte* add_short_leaves(std::byte* at, std::size_t& first, Row row) noexcept;
  template <class Row>
  std::byte* add_row(std::byte* at, const Row& row, std::uint32_t& credit) noexcept;
  std::byte* add_elements(std::byte* at, const ContainerNode& container) noexcept;
  std::byte* add_dictionary(std::byte* at, const DictionaryNode& dictionary) noexcept;
  std::byte* add_array(std::byte* at, const ArrayNode& array) noexcept;
  void refer(std::size_t number) noexcept;

  [[nodiscard]] bool number_next(const std::byte* at) noexcept;
  [[nodiscard]] bool grow_offsets() noexcept;
  [[nodiscard]] bool enqueue(const Queued& queued) noexcept;
  std::byte* make_room(std::byte* at, std::size_t room) noexcept {
    return static_cast<std::size_t>(end_ - at) >= room ? at : grow(at, room);
  }
  std::byte* grow(std::byte* at, std::size_t room) noexcept;
  template <std::size_t Size>
  void put_offsets(std::byte* at) const noexcept;

  const PropertyValue& root_;
  const OmittedEntries& omitted_;
  ByteBuffer& out_;
  const std::size_t before_;  // bytes in the buffer that are not ours
  const std::size_t reference_size_;
  const std::size_t maximum_count_;
  std::byte* start_ = nullptr;
  std::byte* end_ = nullptr;  // of the room
  std::size_t body_end_ = 0;
  std::uint32_t* offsets_ = nullptr;
  std::size_t count_ = 0;  // objects so far
  std::size_t offsets_room_ = 0;
  Queued* queue_ = nullptr;
  std::size_t queued_ = 0;
  std::size_t queue_room_ = 0;
  LeafTable leaves_;
  std::uint32_t booleans_[2] = {};  // the numbers of false and true; 0, which is the top object's, for none
  bool fan_checked_ = false;
  bool has_too_many_ = false;

  std::size_t next_reference_ = 0;  // where it goes
  std::uint32_t key_credit_ = kCredit;
  std::uint32_t value_credit_ = kCredit;
};

template <class T>
bool grow_row(T*& row, std::size_t& room, std::size_t larger) noexcept {
  void* grown = std::realloc(row, larger * sizeof(T));
  if (grown == nullptr) return false;
  row = static_cast<T*>(grown);
  room = larger;
  return true;
}

std::byte* Writer::grow(std::byte* at, std::size_t room) noexcept {
  const std::size_t used = start_ == nullptr ? 0 : static_cast<std::size_t>(at - start_);
  if (room > kLargestFile - used) return nullptr;
  // A buffer that is used again keeps its memory as long as that suffices.
  const std::size_t needed = before_ + used + room;
  const std::size_t likely = std::min(std::max(needed, out_.capacity() * 2), before_ + kLargestFile);
  if (needed > out_.capacity() && !out_.reserve(likely)) return nullptr;
  start_ = out_.data() + before_;
  end_ = start_ + std::min(out_.capacity() - before_, kLargestFile);
  return start_ + used;
}

bool Writer::grow_offsets() noexcept {
  if (count_ == maximum_count_) {
    has_too_many_ = true;
    return false;
  }
  const std::size_t likely = std::max({std::size_t{16}, offsets_room_ * 2, root_.size() * 2 + root_.size() / 4});
  return grow_row(offsets_, offsets_room_, std::min(maximum_count_, likely));
}

bool Writer::enqueue(const Queued& queued) noexcept {
  if (queued_ == queue_room_ && !grow_row(queue_, queue_room_, std::max<std::size_t>(16, queue_room_ * 2))) {
    return false;
  }
  queue_[queued_++] = queued;
  return true;
}

inline bool Writer::number_next(const std::byte* at) noexcept {
  if (count_ == offsets_room_ && !grow_offsets()) return false;
  offsets_[count_++] = static_cast<std::uint32_t>(at - start_);
  return true;
}

inline void Writer::refer(std::size_t number) noexcept {
  format::put_integer(start_ + next_reference_, number, reference_size_);
  next_reference_ += reference_size_;
}

inline std::byte* Writer::put_new_leaf(std::byte* at, Word word) noexcept {
  at = make_room(at, leaf_room(word));
  return at != nullptr && number_next(at) ? put_leaf(at, word) : nullptr;
}

// A container below the top one with several holders may be met again and again: the whole walk is measured once
// before the first such container is put.
std::byte* Writer::put_container(std::byte* at, Word word) noexcept {
  const bool is_dictionary = kind_of(word) == PropertyKind::dictionary;
  if (!fan_checked_ && count_ > 0 && node_of(word)->count.load(std::memory_order_relaxed) > 1) {
    fan_checked_ = true;
    if (!is_within_limits(root_)) return nullptr;
  }
  const ContainerNode* container = is_dictionary ? &dictionary_at(word) : static_cast<ContainerNode*>(node_of(word));
  std::size_t size = is_dictionary ? static_cast<const DictionaryNode*>(container)->live : container->used;
  if (count_ == 0) size -= omitted_.count();
  const std::size_t references = (is_dictionary ? 2 * size : size) * reference_size_;
  at = make_room(at, kLeafRoom + references);
  if (at == nullptr || !number_next(at)) return nullptr;
  at = put_marker(at, is_dictionary ? format::kDictionary : format::kArray, size);
  if (!enqueue({container, static_cast<std::uint32_t>(at - start_)})) return nullptr;
  return at + references;
}

inline std::byte* Writer::put_object(std::byte* at, Word word) noexcept {
  return kind_of(word) < PropertyKind::array ? put_new_leaf(at, word) : put_container(at, word);
}

inline std::byte* Writer::add_boolean(std::byte* at, Word word) noexcept {
  std::uint32_t& number = booleans_[word == kTrue ? 1 : 0];
  const bool is_new = number == 0;
  if (is_new) number = static_cast<std::uint32_t>(count_);
  refer(number);
  return is_new ? put_new_leaf(at, word) : at;
}

// Refers to a leaf that was put before, or puts it.
inline std::byte* Writer::add_leaf(std::byte* at, Word word, std::uint32_t& credit) noexcept {
  if (credit > 0) {
    auto number = static_cast<std::uint32_t>(count_);
    const LeafTable::Outcome outcome = leaves_.find_or_add(word, number);
    if (outcome == LeafTable::Outcome::no_memory) return nullptr;
    --credit;
    if (outcome == LeafTable::Outcome::found) {
      credit = std::min(credit + kEarned, kMaximumCredit);
      refer(number);
      return at;
    }
  }
  refer(count_);
  return put_new_leaf(at, word);
}

std::byte* Writer::add_value(std::byte* at, Word word, std::uint32_t& credit) noexcept {
  if (!is_node(word)) {
    return kind_of(word) == PropertyKind::boolean ? add_boolean(at, word) : add_leaf(at, word, credit);
  }
  if (node_of(word)->kind < PropertyKind::array) return add_leaf(at, word, credit);
  refer(count_);
  return put_container(at, word);
}

// Refers to short leaves, one behind the other from element `first` on, and puts them; moves `first` to the first
// element that is none, or for which there is no room. Their kinds cannot be foreseen, and a branch on one is
// mispredicted: what is chosen here is chosen with masks, because compilers make branches of conditions.
template <class Row>
std::byte* Writer::add_short_leaves(std::byte* at, std::size_t& first, const Row row) noexcept {
  // Bytes that are written may be anything's, to the compiler: what it must not read again is copied.
  std::byte* const start = start_;
  const std::byte* const end = end_;
  std::uint32_t* const offsets = offsets_;
  const std::size_t reference_size = reference_size_;
  const std::uint32_t booleans[2] = {booleans_[0], booleans_[1]};
  std::byte* reference = start + next_reference_;
  std::size_t count = count_;
  std::size_t i = first;
  const std::size_t last = std::min(row.size(), i + (offsets_room_ - count));
  for (; i < last && static_cast<std::size_t>(end - at) >= kLeafRoom; ++i) {
    const Word word = row[i];
    std::size_t number = count, is_boolean = 0;
    if constexpr (Row::kHasOnlyTexts) {
      if (!is_short_leaf(*bytes_of(word))) break;
      offsets[count++] = static_cast<std::uint32_t>(at - start);
      at = put_short_leaf(at, *bytes_of(word));
    } else {
      const IntegerLeaf integer(word);
      const Word is_immediate = 0 - (word & kImmediateBit);
      const BytesNode& leaf = *bytes_of(word ^ ((word ^ word_of(&integer)) & is_immediate));
      if (!is_short_leaf(leaf)) break;
      is_boolean = 0 - (word >> 1 & is_immediate & 1);
      number = (count & ~is_boolean) | (booleans[word >> 3 & 1] & is_boolean);
      if (number == 0) break;
      offsets[count] = static_cast<std::uint32_t>(at - start);
      count += 1 + is_boolean;
      at += static_cast<std::size_t>(put_short_leaf(at, leaf) - at) & ~is_boolean;
    }
    format::put_integer(reference, number, reference_size);
    reference += reference_size;
  }
  first = i;
  count_ = count;
  next_reference_ = static_cast<std::size_t>(reference - start);
  return at;
}

// Elements that are looked up, and those that are no short leaves, are added one by one.
template <class Row>
std::byte* Writer::add_row(std::byte* at, const Row& row, std::uint32_t& credit) noexcept {
  for (std::size_t i = 0; i < row.size() && at != nullptr;) {
    if (credit == 0) at = add_short_leaves(at, i, row);
    if (i < row.size()) at = add_value(at, row[i++], credit);
  }
  return at;
}

std::byte* Writer::add_dictionary(std::byte* at, const DictionaryNode& dictionary) noexcept {
  const bool is_top = &dictionary == queue_[0].container;
  const SortedEntries sorted(dictionary, is_top ? &omitted_ : nullptr);
  if (!sorted) return nullptr;
  // The keys of one dictionary differ: in a large one they are not looked up among each other.
  std::uint32_t none = 0;
  at = add_row(at, EntryRow<&Entry::key>(sorted), sorted.size() > kCredit ? none : key_credit_);
  return at == nullptr ? nullptr : add_row(at, EntryRow<&Entry::value>(sorted), value_credit_);
}

std::byte* Writer::add_array(std::byte* at, const ArrayNode& array) noexcept {
  return add_row(at, ElementRow(array), value_credit_);
}

std::byte* Writer::add_elements(std::byte* at, const ContainerNode& container) noexcept {
  return container.kind == PropertyKind::array ? add_array(at, static_cast<const ArrayNode&>(container))
                                               : add_dictionary(at, static_cast<const DictionaryNode&>(container));
}

std::byte* put_header(std::byte* at) noexcept {
  std::memcpy(at, format::kHeader.data(), format::kHeader.size());
  return at + format::kHeader.size();
}

bool Writer::put_objects() noexcept {
  const std::size_t likely = std::min(root_.size() * kLikelyElementRoom, kLargestGuess);
  std::byte* at = grow(nullptr, format::kHeader.size() + kLeafRoom + likely);
  if (at == nullptr) return false;
  at = put_object(put_header(at), root_.word());
  std::size_t level_end = 1, depth = 1;
  for (std::size_t i = 0; i < queued_ && at != nullptr; ++i) {
    if (i == level_end) {
      level_end = queued_;
      if (++depth > kMaximumDepth) return false;
    }
    if (i + 2 < queued_) fetch_elements(*queue_[i + 2].container);
    next_reference_ = queue_[i].references;
    if (element_count(*queue_[i].container) > kCredit) value_credit_ = std::max(value_credit_, kCredit);
    at = add_elements(at, *queue_[i].container);
  }
  if (at == nullptr) return false;
  body_end_ = static_cast<std::size_t>(at - start_);
  return true;
}

template <std::size_t Size>
void Writer::put_offsets(std::byte* at) const noexcept {
  for (std::size_t i = 0; i < count_; ++i) format::put_integer(at + i * Size, offsets_[i], Size);
}

bool Writer::finish() noexcept {
  const std::size_t offset_size = format::integer_width(body_end_);
  const std::size_t table_size = count_ * offset_size;
  std::byte* at = make_room(start_ + body_end_, table_size + format::kTrailerSize);
  if (at == nullptr) return false;
  switch (offset_size) {
    case 1: put_offsets<1>(at); break;
    case 2: put_offsets<2>(at); break;
    default: put_offsets<4>(at); break;
  }
  at += table_size;
  std::memset(at, 0, format::kTrailerSize);
  at[format::kOffsetSizeAt] = static_cast<std::byte>(offset_size);
  at[format::kReferenceSizeAt] = static_cast<std::byte>(reference_size_);
  format::put_integer(at + format::kObjectCountAt, count_, 8);
  format::put_integer(at + format::kTableOffsetAt, body_end_, 8);
  return out_.resize(before_ + body_end_ + table_size + format::kTrailerSize);
}

}  // namespace

bool write_binary(const PropertyValue& value, ByteBuffer& out, const OmittedEntries& omitted) noexcept {
  if (!value) return false;
  for (std::size_t reference_size = std::min(format::integer_width(value.size() * 2), kLargestReference);;) {
    Writer writer(value, omitted, out, reference_size);
    if (!writer.put_objects()) {
      if (!writer.has_too_many() || reference_size == kLargestReference) return false;
      reference_size *= 2;
      continue;
    }
    const std::size_t fitting = format::integer_width(writer.count() - 1);
    if (fitting == reference_size) return writer.finish();
    reference_size = fitting;
  }
}

}  // namespace quorvel
