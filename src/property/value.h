// PropertyValue: the property-list value that the whole house trades in.
//
// A PropertyValue is one machine word: nothing, a boolean or small integer held in the word itself, or a counted
// reference to a node. Copying one adds a reference, destroying one drops it; nobody counts by hand.
//
// Containers have value semantics. A mutable container that somebody else refers to as well is copied, one level deep,
// before it changes, so a change is seen only through the PropertyValue it was made through, a stored value never
// changes behind its holder's back, and no container can come to hold itself.
//
// Threads: different PropertyValues may be used from different threads at once even where they refer to the same node;
// one PropertyValue object needs its caller's lock, like any other variable. Nothing here throws: an operation that
// runs out of memory reports it as its comment says.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string_view>
#include <utility>

#include "property/hash.h"
#include "property/node.h"

namespace quorvel {

class DictionaryRange;
struct DictionaryEntry;

class [[nodiscard]] PropertyValue {
 public:
  /// No value. The accessors below answer it as they answer a value of another kind.
  constexpr PropertyValue() noexcept = default;
  constexpr PropertyValue(std::nullptr_t) noexcept {}
  PropertyValue(const PropertyValue& other) noexcept : word_(other.word_) { detail::retain(word_); }
  PropertyValue(PropertyValue&& other) noexcept : word_(std::exchange(other.word_, 0)) {}
  PropertyValue& operator=(PropertyValue other) noexcept {
    std::swap(word_, other.word_);
    return *this;
  }
  ~PropertyValue() { detail::release(word_); }

  static PropertyValue boolean(bool value) noexcept { return adopt(value ? detail::kTrue : detail::kFalse); }
  /// The makers below give no value when memory runs out.
  static PropertyValue integer(std::int64_t value) noexcept;
  static PropertyValue unsigned_integer(std::uint64_t value) noexcept;
  static PropertyValue real(double value) noexcept;
  /// `seconds` since 2001-01-01T00:00:00Z.
  static PropertyValue date(double seconds) noexcept;
  /// No value also for a text that is not valid UTF-8 or is 4 GiB or longer.
  static PropertyValue string(std::string_view utf8) noexcept;
  /// The two texts joined; both must be valid UTF-8, as texts of values are.
  static PropertyValue joined_string(std::string_view head, std::string_view tail) noexcept;
  static PropertyValue data(std::span<const std::byte> bytes) noexcept;
  /// Empty, mutable containers with room for `expected` elements.
  static PropertyValue array(std::size_t expected = 0) noexcept;
  static PropertyValue dictionary(std::size_t expected = 0) noexcept;

  [[nodiscard]] explicit operator bool() const noexcept { return word_ != 0; }
  [[nodiscard]] PropertyKind kind() const noexcept { return detail::kind_of(word_); }
  [[nodiscard]] bool is_string() const noexcept { return kind() == PropertyKind::string; }
  [[nodiscard]] bool is_dictionary() const noexcept { return kind() == PropertyKind::dictionary; }
  [[nodiscard]] bool is_container() const noexcept { return kind() >= PropertyKind::array; }
  /// True when the value itself accepts changes.
  [[nodiscard]] bool is_mutable() const noexcept {
    return detail::is_node(word_) && (detail::node_of(word_)->flags & detail::kMutable) != 0;
  }
  /// True when both refer to one and the same object.
  [[nodiscard]] bool same_object(const PropertyValue& other) const noexcept { return word_ == other.word_; }

  /// The value's content; of another kind: false, nothing, 0 or empty. Views last as long as the value is held.
  [[nodiscard]] bool to_boolean() const noexcept { return word_ == detail::kTrue; }
  [[nodiscard]] std::optional<std::int64_t> to_int64() const noexcept {
    if ((word_ & detail::kTagMask) == detail::kIntegerTag) return detail::immediate_value(word_);
    return wide_to_int64();
  }
  [[nodiscard]] std::optional<std::uint64_t> to_uint64() const noexcept;
  /// The number of a real, or the seconds of a date.
  [[nodiscard]] double to_double() const noexcept;
  [[nodiscard]] std::string_view text() const noexcept {
    return is_string() ? detail::text_of(word_) : std::string_view{};
  }
  [[nodiscard]] std::span<const std::byte> bytes() const noexcept;

  /// The number of elements of a container; 0 for every other kind.
  [[nodiscard]] std::size_t size() const noexcept;
  /// Element `index` of an array, borrowed; no value when there is none.
  [[nodiscard]] const PropertyValue& at(std::size_t index) const noexcept;
  /// The value under `key` of a dictionary, borrowed; no value when there is none.
  [[nodiscard]] const PropertyValue& get(const HashedKey& key) const noexcept;
  /// The entry under `key` of a dictionary, borrowed; a key and a value that are none when there is no such
  /// entry.
  [[nodiscard]] DictionaryEntry find(const HashedKey& key) const noexcept;
  /// The entries of a dictionary in their order: that of the file it came from, then as they were added.
  [[nodiscard]] DictionaryRange entries() const noexcept;

  /// Stores `value` under `key`, a string; the entry keeps its place when the key is there already. False, and nothing
  /// changed, when this is no mutable dictionary, `key` is no string, `value` is none, or memory runs out.
  [[nodiscard]] bool set(const PropertyValue& key, PropertyValue value) noexcept;
  [[nodiscard]] bool set(const HashedKey& key, PropertyValue value) noexcept;
  /// Adds an entry under a key that is known not to be there; false as for `set`. The key's text must be valid UTF-8.
  [[nodiscard]] bool add(const HashedKey& key, PropertyValue value) noexcept;
  /// The same, but the entry's key is `shared`, a string equal to `key` that others hold as well. Without one, a string
  /// is made.
  [[nodiscard]] bool add(const HashedKey& key, PropertyValue shared, PropertyValue value) noexcept;
  /// Takes the entry out and returns its value; none when there was none, this is no mutable dictionary, or the copy
  /// that a shared dictionary needs first could not be made.
  PropertyValue remove(const HashedKey& key) noexcept;
  /// Adds an element to a mutable array; false as for `set`.
  [[nodiscard]] bool append(PropertyValue value) noexcept;
  /// The slot of an element of a mutable container, for changing it in place; null when there is none or the copy that
  /// a shared container needs first could not be made. Valid until the container changes.
  [[nodiscard]] PropertyValue* slot(const HashedKey& key) noexcept;
  [[nodiscard]] PropertyValue* slot(std::size_t index) noexcept;
  /// The bytes of a mutable data value, for changing them; empty otherwise, and when a copy could not be made.
  [[nodiscard]] std::span<std::byte> mutable_bytes() noexcept;

  /// A mutable copy of a dictionary, array or data value: the same elements, shared, not copied. None for every other
  /// kind and when memory runs out.
  [[nodiscard]] PropertyValue mutable_copy() const noexcept;

  /// For this folder and the encoding: the word itself, and a value that takes over the word's reference.
  [[nodiscard]] detail::Word word() const noexcept { return word_; }
  [[nodiscard]] static PropertyValue adopt(detail::Word word) noexcept {
    PropertyValue value;
    value.word_ = word;
    return value;
  }
  [[nodiscard]] detail::Word take() noexcept { return std::exchange(word_, 0); }

 private:
  [[nodiscard]] std::optional<std::int64_t> wide_to_int64() const noexcept;
  [[nodiscard]] bool make_unique(PropertyKind wanted) noexcept;

  detail::Word word_ = 0;
};
static_assert(sizeof(PropertyValue) == sizeof(detail::Word));

/// A slot of a container seen as the value it holds.
[[nodiscard]] inline const PropertyValue& borrowed(const detail::Word& slot) noexcept {
  return reinterpret_cast<const PropertyValue&>(slot);
}

struct DictionaryEntry {
  const PropertyValue& key;
  const PropertyValue& value;
};

/// The live entries of a dictionary, for a range loop. The dictionary may not change or end meanwhile.
class DictionaryRange {
 public:
  class iterator {
   public:
    iterator(const detail::Entry* at, const detail::Entry* end) noexcept : at_(at), end_(end) { skip(); }
    [[nodiscard]] DictionaryEntry operator*() const noexcept { return {borrowed(at_->key), borrowed(at_->value)}; }
    iterator& operator++() noexcept {
      ++at_;
      skip();
      return *this;
    }
    [[nodiscard]] bool operator!=(const iterator& other) const noexcept { return at_ != other.at_; }

   private:
    void skip() noexcept {
      while (at_ != end_ && at_->key == 0) ++at_;
    }
    const detail::Entry* at_;
    const detail::Entry* end_;
  };
  DictionaryRange(const detail::Entry* first, const detail::Entry* last) noexcept : first_(first), last_(last) {}
  [[nodiscard]] iterator begin() const noexcept { return {first_, last_}; }
  [[nodiscard]] iterator end() const noexcept { return {last_, last_}; }
  /// The first live entry in slot `position` or behind it; `position` becomes the slot behind that entry, so that a
  /// walk can be left and taken up again. Null at the end.
  [[nodiscard]] const detail::Entry* next(std::size_t& position) const noexcept {
    for (const auto slots = static_cast<std::size_t>(last_ - first_); position < slots;) {
      const detail::Entry& entry = first_[position++];
      if (entry.key != 0) return &entry;
    }
    return nullptr;
  }

 private:
  const detail::Entry* first_;
  const detail::Entry* last_;
};

/// Deep equality. Kinds must match (an integer never equals a real), reals and dates compare bit by bit, so that a NaN
/// equals itself and 0.0 differs from -0.0; the order of a dictionary's entries does not count. False also when the
/// values are nested deeper or fan out further than limits.h allows.
[[nodiscard]] bool operator==(const PropertyValue& left, const PropertyValue& right) noexcept;

/// A text that lives as long as the process, made when the program is compiled: a name that many places share. Its
/// value is neither allocated nor counted. Only for variables of static storage: their values outlive every scope.
template <std::size_t Size>
class alignas(8) StaticText : detail::BytesNode {
 public:
  consteval StaticText(const char (&text)[Size])  // not explicit: reads as the text it is
      : BytesNode{{0, PropertyKind::string, detail::kStatic | detail::kVerbatim, 0}, Size - 1} {
    for (std::size_t i = 0; i < Size; ++i) {
      if (static_cast<unsigned char>(text[i]) > 0x7f) detail::refuse_to_compile("a static text is ASCII");
      text_[i] = text[i];
    }
  }
  operator PropertyValue() const noexcept {  // not explicit: a name is a value
    return PropertyValue::adopt(detail::word_of(this));
  }
  [[nodiscard]] constexpr std::string_view text() const noexcept { return {text_, Size - 1}; }
  [[nodiscard]] constexpr const char* c_str() const noexcept { return text_; }

 private:
  char text_[Size < 20 ? 20 : Size] = {};
};

}  // namespace quorvel
