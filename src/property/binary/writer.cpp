// Writing happens in one pass, breadth first: a container is followed by its elements, those by theirs. Its references
// are left open where it stands, and filled in when its turn comes and its elements get their numbers. Only the size of
// a reference has to be guessed; when the guess turns out wrong, the value is written anew with the right one.

#include <algorithm>
#include <cstring>

#include "property/binary/binary.h"
#include "property/binary/element_rows.h"
#include "property/binary/leaf_numbers.h"
#include "property/binary/leaf_writer.h"
#include "property/growing_row.h"
#include "property/walk.h"

namespace quorvel {

namespace format = binary_format;
using namespace detail;

namespace {

// Offsets are kept in four bytes while a file is written.
constexpr std::size_t kLargestFile = UINT32_MAX;
constexpr std::size_t kMaximumObjects = 0xffff'fffe;
constexpr std::size_t kLargestReference = 4;

// The room that an element takes in common files; a wrong guess costs another allocation. No more than so much is asked
// for on a guess: what many small elements do not need must not be what memory runs out for.
constexpr std::size_t kLikelyElementRoom = 72;
constexpr std::size_t kLargestGuess = std::size_t{4} << 20;

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
  std::byte* add_leaf(std::byte* at, Word word, Credit& credit) noexcept;
  std::byte* add_value(std::byte* at, Word word, Credit& credit) noexcept;
  template <class Row>
  std::byte* add_short_leaves(std::byte* at, std::size_t& first, Row row) noexcept;
  template <class Row>
  std::byte* add_row(std::byte* at, const Row& row, Credit& credit) noexcept;
  std::byte* add_elements(std::byte* at, const ContainerNode& container) noexcept;
  std::byte* add_dictionary(std::byte* at, const DictionaryNode& dictionary) noexcept;
  std::byte* add_array(std::byte* at, const ArrayNode& array) noexcept;
  void refer(std::size_t number) noexcept;

  [[nodiscard]] bool number_next(const std::byte* at) noexcept;
  [[nodiscard]] bool grow_offsets() noexcept;
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
  GrowingRow<std::uint32_t> offsets_;  // by the objects' numbers; filled by hand up to `count_`
  std::size_t count_ = 0;
  GrowingRow<Queued> queue_;
  LeafNumbers numbers_;
  bool fan_checked_ = false;
  bool has_too_many_ = false;

  std::size_t next_reference_ = 0;  // where it goes
  Credit key_credit_, value_credit_;
};

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
  const std::size_t likely = std::max({std::size_t{16}, offsets_.room() * 2, root_.size() * 2 + root_.size() / 4});
  return offsets_.reserve(std::min(maximum_count_, likely));
}

inline bool Writer::number_next(const std::byte* at) noexcept {
  if (count_ == offsets_.room() && !grow_offsets()) return false;
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
  const auto* container = static_cast<const ContainerNode*>(node_of(word));
  std::size_t size = element_count(*container);
  if (count_ == 0) size -= omitted_.count();
  const std::size_t references = (is_dictionary ? 2 * size : size) * reference_size_;
  at = make_room(at, kLeafRoom + references);
  if (at == nullptr || !number_next(at)) return nullptr;
  at = put_marker(at, is_dictionary ? format::kDictionary : format::kArray, size);
  if (!queue_.add({container, static_cast<std::uint32_t>(at - start_)})) return nullptr;
  return at + references;
}

inline std::byte* Writer::put_object(std::byte* at, Word word) noexcept {
  return kind_of(word) < PropertyKind::array ? put_new_leaf(at, word) : put_container(at, word);
}

inline std::byte* Writer::add_boolean(std::byte* at, Word word) noexcept {
  std::uint32_t& number = numbers_.boolean(word == kTrue);
  const bool is_new = number == 0;
  if (is_new) number = static_cast<std::uint32_t>(count_);
  refer(number);
  return is_new ? put_new_leaf(at, word) : at;
}

// Refers to a leaf that was put before, or puts it.
inline std::byte* Writer::add_leaf(std::byte* at, Word word, Credit& credit) noexcept {
  if (credit.pays()) {
    std::uint32_t number = 0;
    if (!numbers_.find_or_add(word, static_cast<std::uint32_t>(count_), credit, number)) return nullptr;
    if (number != count_) {
      refer(number);
      return at;
    }
  }
  refer(count_);
  return put_new_leaf(at, word);
}

std::byte* Writer::add_value(std::byte* at, Word word, Credit& credit) noexcept {
  if (!is_node(word)) {
    return kind_of(word) == PropertyKind::boolean ? add_boolean(at, word) : add_leaf(at, word, credit);
  }
  if (node_of(word)->kind < PropertyKind::array) return add_leaf(at, word, credit);
  refer(count_);
  return put_container(at, word);
}

// Refers to short leaves from element `first` on and puts them; moves `first` to the first element that is no short
// leaf, or for which there is no room. The kinds of elements cannot be foreseen, and a branch on one is mispredicted:
// whatever depends on a kind is chosen with masks. A boolean that has its number already is put as well, but what is
// put next overwrites it.
template <class Row>
std::byte* Writer::add_short_leaves(std::byte* at, std::size_t& first, const Row row) noexcept {
  // Stores of bytes may change any object that others can see: copies spare a reload after each.
  std::byte* const start = start_;
  const std::byte* const end = end_;
  std::uint32_t* const offsets = &offsets_[0];
  const std::size_t reference_size = reference_size_;
  const std::uint32_t booleans[2] = {numbers_.boolean(false), numbers_.boolean(true)};
  std::byte* reference = start + next_reference_;
  std::size_t count = count_;
  std::size_t i = first;
  const std::size_t last = std::min(row.size(), i + (offsets_.room() - count));
  for (; i < last && static_cast<std::size_t>(end - at) >= kLeafRoom; ++i) {
    const Word word = row[i];
    std::size_t number = count, is_boolean = 0;
    if constexpr (Row::kHasOnlyTexts) {
      if (!is_short_leaf(*bytes_of(word))) break;
      offsets[count++] = static_cast<std::uint32_t>(at - start);
      at = put_short_leaf(at, *bytes_of(word));
    } else {
      const IntegerLeaf integer(word);
      const Word is_immediate = mask_of(word & kImmediateBit);
      const BytesNode& leaf = *bytes_of(select(is_immediate, word_of(&integer), word));
      if (!is_short_leaf(leaf)) break;
      static_assert((kBooleanTag ^ kIntegerTag) == 2, "the second bit tells booleans from integers");
      is_boolean = mask_of(word >> 1 & is_immediate);
      number = select(is_boolean, booleans[word >> kTagBits & 1], count);
      if (number == 0) break;
      offsets[count] = static_cast<std::uint32_t>(at - start);
      count += 1 + is_boolean;  // a mask with all bits set is -1
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
std::byte* Writer::add_row(std::byte* at, const Row& row, Credit& credit) noexcept {
  for (std::size_t i = 0; i < row.size() && at != nullptr;) {
    if (!credit.pays()) at = add_short_leaves(at, i, row);
    if (i < row.size()) at = add_value(at, row[i++], credit);
  }
  return at;
}

std::byte* Writer::add_dictionary(std::byte* at, const DictionaryNode& dictionary) noexcept {
  const bool is_top = &dictionary == queue_[0].container;
  const SortedEntries sorted(dictionary, is_top ? &omitted_ : nullptr);
  if (!sorted) return nullptr;
  // The keys of one dictionary differ: in a large one they are not looked up among each other.
  Credit none;
  none.cancel();
  at = add_row(at, EntryRow<&Entry::key>(sorted), sorted.size() > Credit::kFull ? none : key_credit_);
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
  for (std::size_t i = 0; i < queue_.size() && at != nullptr; ++i) {
    if (i == level_end) {
      level_end = queue_.size();
      if (++depth > kMaximumDepth) return false;
    }
    if (i + 2 < queue_.size()) fetch_elements(*queue_[i + 2].container);
    next_reference_ = queue_[i].references;
    if (element_count(*queue_[i].container) > Credit::kFull) value_credit_.refill();
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
