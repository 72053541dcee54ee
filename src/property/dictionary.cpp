// Dictionaries: entries in a row, in the order they came, and above a handful of them an index with linear probing.
// A removed entry leaves a gap in the row until the row is next moved.

#include <cstdlib>
#include <cstring>
#include <new>

#include "property/dictionary_index.h"
#include "property/unicode.h"
#include "property/value.h"

namespace quorvel {
namespace detail {

namespace {

// Gives the dictionary an index of `size` slots; the old one stays when memory runs out.
bool rebuild_index(DictionaryNode& dictionary, std::uint32_t size) noexcept {
  auto* fresh = static_cast<IndexSlot*>(std::calloc(size, sizeof(IndexSlot)));
  if (fresh == nullptr) return false;
  if (dictionary.index_size > 0) {
    for (std::uint32_t i = 0; i < dictionary.index_size; ++i) {
      if (dictionary.index[i].entry != 0) place(fresh, size - 1, dictionary.index[i]);
    }
  } else {
    for (std::uint32_t i = 0; i < dictionary.used; ++i) {
      const Word key = dictionary.entries()[i].key;
      if (key != 0) place(fresh, size - 1, {hash_text(text_of(key)), i + 1});
    }
  }
  std::free(dictionary.index);
  dictionary.index = fresh;
  dictionary.index_size = size;
  return true;
}

bool is_behind_last(const DictionaryNode& dictionary, std::string_view key) noexcept {
  for (std::uint32_t i = dictionary.used; i-- > 0;) {
    if (dictionary.entries()[i].key != 0) return text_of(dictionary.entries()[i].key) < key;
  }
  return true;
}

void forget_order(DictionaryNode& dictionary) noexcept {
  if (dictionary.order.load(std::memory_order_relaxed) == nullptr) return;
  std::free(dictionary.order.exchange(nullptr, std::memory_order_relaxed));
}

// Closes the gaps, so that every entry is live. The entries' places change: the index is made anew, and an order that
// was noted is forgotten. False, and nothing changed, when memory runs out.
bool compact(DictionaryNode& dictionary) noexcept {
  IndexSlot* index = nullptr;
  if (dictionary.index_size > 0) {
    index = static_cast<IndexSlot*>(std::calloc(dictionary.index_size, sizeof(IndexSlot)));
    if (index == nullptr) return false;
  }
  forget_order(dictionary);
  std::uint32_t kept = 0, ascending = 0;
  for (std::uint32_t i = 0; i < dictionary.used; ++i) {
    if (i == dictionary.ascending) ascending = kept;
    const Entry entry = dictionary.entries()[i];
    if (entry.key == 0) continue;
    dictionary.entries()[kept++] = entry;
    if (index != nullptr) place(index, dictionary.index_size - 1, {hash_text(text_of(entry.key)), kept});
  }
  dictionary.ascending = dictionary.ascending == dictionary.used ? kept : ascending;
  dictionary.used = kept;
  if (index != nullptr) {
    std::free(dictionary.index);
    dictionary.index = index;
  }
  return true;
}

bool make_room(DictionaryNode& dictionary) noexcept {
  if (dictionary.used == dictionary.capacity) {
    if (dictionary.live < dictionary.used / 4 * 3) {
      if (!compact(dictionary)) return false;
    } else if (!grow_storage(dictionary, sizeof(Entry))) {
      return false;
    }
  }
  return prepare_index(dictionary, dictionary.live + 1);
}

std::uint32_t find_slot(const DictionaryNode& dictionary, const HashedKey& key) noexcept {
  const std::uint32_t mask = dictionary.index_size - 1;
  for (std::uint32_t at = key.hash & mask; dictionary.index[at].entry != 0; at = (at + 1) & mask) {
    if (dictionary.index[at].hash == key.hash &&
        text_of(dictionary.entries()[dictionary.index[at].entry - 1].key) == key.text) {
      return at;
    }
  }
  return dictionary.index_size;
}

// Empties a slot, and moves the slots back that stand behind it only because it was taken.
void clear_slot(DictionaryNode& dictionary, std::uint32_t at) noexcept {
  const std::uint32_t mask = dictionary.index_size - 1;
  for (std::uint32_t next = (at + 1) & mask; dictionary.index[next].entry != 0; next = (next + 1) & mask) {
    const std::uint32_t home = dictionary.index[next].hash & mask;
    if (((next - home) & mask) >= ((next - at) & mask)) {
      dictionary.index[at] = dictionary.index[next];
      at = next;
    }
  }
  dictionary.index[at] = {};
}

}  // namespace

DictionaryNode* new_dictionary(std::size_t capacity, std::uint8_t flags) noexcept {
  if (capacity > kMaximumSlots) return nullptr;
  void* memory = std::malloc(sizeof(DictionaryNode) + capacity * sizeof(Entry));
  if (memory == nullptr) return nullptr;
  auto* node = new (memory) DictionaryNode;
  node->count.store(1, std::memory_order_relaxed);
  node->kind = PropertyKind::dictionary;
  node->flags = static_cast<std::uint8_t>(flags | kInlineStorage);
  node->used = node->live = node->index_size = node->ascending = 0;
  node->order.store(nullptr, std::memory_order_relaxed);
  node->capacity = static_cast<std::uint32_t>(capacity);
  node->storage = node + 1;
  node->index = nullptr;
  return node;
}

bool prepare_index(DictionaryNode& dictionary, std::uint32_t entries) noexcept {
  if (entries <= kUnindexed && dictionary.index_size == 0) return true;
  if (std::uint64_t{entries} * 4 <= std::uint64_t{dictionary.index_size} * 3) return true;
  return rebuild_index(dictionary, index_size_for(entries));
}

bool make_index(DictionaryNode& dictionary, std::uint32_t entries) noexcept {
  if (entries <= kUnindexed) return true;
  const std::uint32_t size = index_size_for(entries);
  dictionary.index = static_cast<IndexSlot*>(std::calloc(size, sizeof(IndexSlot)));
  if (dictionary.index == nullptr) return false;
  dictionary.index_size = size;
  return true;
}

Entry* find_entry(const DictionaryNode& dictionary, const HashedKey& key) noexcept {
  if (dictionary.index_size > 0) {
    const std::uint32_t at = find_slot(dictionary, key);
    return at == dictionary.index_size ? nullptr : &dictionary.entries()[dictionary.index[at].entry - 1];
  }
  for (std::uint32_t i = 0; i < dictionary.used; ++i) {
    Entry& entry = dictionary.entries()[i];
    if (entry.key != 0 && text_of(entry.key) == key.text) return &entry;
  }
  return nullptr;
}

void add_entry(DictionaryNode& dictionary, const HashedKey& key, Word key_word, Word value) noexcept {
  forget_order(dictionary);
  if (dictionary.ascending == dictionary.used && is_behind_last(dictionary, key.text)) ++dictionary.ascending;
  dictionary.entries()[dictionary.used++] = {key_word, value};
  ++dictionary.live;
  if (dictionary.index_size > 0) place(dictionary.index, dictionary.index_size - 1, {key.hash, dictionary.used});
}

DictionaryNode* copy_dictionary(const DictionaryNode& from) noexcept {
  DictionaryNode* copy = new_dictionary(from.used, kMutable);
  if (copy == nullptr) return nullptr;
  copy->ascending = from.ascending;
  if (from.index_size > 0) {
    copy->index = static_cast<IndexSlot*>(std::malloc(from.index_size * sizeof(IndexSlot)));
    if (copy->index == nullptr) {
      std::free(copy);
      return nullptr;
    }
    std::memcpy(copy->index, from.index, from.index_size * sizeof(IndexSlot));
    copy->index_size = from.index_size;
  }
  if (from.used > 0) std::memcpy(copy->entries(), from.entries(), from.used * sizeof(Entry));
  copy->used = from.used;
  copy->live = from.live;
  retain_all(&copy->entries()->key, std::size_t{copy->used} * 2);
  return copy;
}

}  // namespace detail

using namespace detail;

namespace {

const PropertyValue kNone;

DictionaryNode& dictionary_of(Word word) noexcept { return *static_cast<DictionaryNode*>(node_of(word)); }

}  // namespace

const PropertyValue& PropertyValue::get(const HashedKey& key) const noexcept {
  if (!is_dictionary()) return kNone;
  const Entry* entry = find_entry(dictionary_at(word_), key);
  return entry == nullptr ? kNone : borrowed(entry->value);
}

DictionaryEntry PropertyValue::find(const HashedKey& key) const noexcept {
  const Entry* entry = is_dictionary() ? find_entry(dictionary_at(word_), key) : nullptr;
  if (entry == nullptr) return {kNone, kNone};
  return {borrowed(entry->key), borrowed(entry->value)};
}

DictionaryRange PropertyValue::entries() const noexcept {
  if (!is_dictionary()) return {nullptr, nullptr};
  const DictionaryNode& dictionary = dictionary_at(word_);
  return {dictionary.entries(), dictionary.entries() + dictionary.used};
}

bool PropertyValue::set(const PropertyValue& key, PropertyValue value) noexcept {
  if (!key.is_string() || !value || !make_unique(PropertyKind::dictionary)) return false;
  DictionaryNode& dictionary = dictionary_of(word_);
  const HashedKey hashed(key.text());
  if (Entry* entry = find_entry(dictionary, hashed)) {
    std::swap(*reinterpret_cast<PropertyValue*>(&entry->value), value);
    return true;
  }
  if (!make_room(dictionary)) return false;
  add_entry(dictionary, hashed, PropertyValue(key).take(), value.take());
  return true;
}

bool PropertyValue::set(const HashedKey& key, PropertyValue value) noexcept {
  if (!value || !make_unique(PropertyKind::dictionary)) return false;
  if (Entry* entry = find_entry(dictionary_of(word_), key)) {
    std::swap(*reinterpret_cast<PropertyValue*>(&entry->value), value);
    return true;
  }
  return check_utf8(key.text) != TextCheck::invalid && add(key, std::move(value));
}

bool PropertyValue::add(const HashedKey& key, PropertyValue value) noexcept {
  return add(key, nullptr, std::move(value));
}

bool PropertyValue::add(const HashedKey& key, PropertyValue shared, PropertyValue value) noexcept {
  if (!value || !make_unique(PropertyKind::dictionary)) return false;
  DictionaryNode& dictionary = dictionary_of(word_);
  if (!shared) shared = joined_string(key.text, {});
  if (!shared || !make_room(dictionary)) return false;
  add_entry(dictionary, key, shared.take(), value.take());
  return true;
}

PropertyValue PropertyValue::remove(const HashedKey& key) noexcept {
  if (!is_dictionary() || !is_mutable() || find_entry(dictionary_of(word_), key) == nullptr) return nullptr;
  if (!make_unique(PropertyKind::dictionary)) return nullptr;
  DictionaryNode& dictionary = dictionary_of(word_);
  Entry* entry = find_entry(dictionary, key);
  if (dictionary.index_size > 0) clear_slot(dictionary, find_slot(dictionary, key));
  PropertyValue removed = adopt(entry->value);
  release(entry->key);
  *entry = {};
  forget_order(dictionary);
  if (--dictionary.live == 0) dictionary.used = dictionary.ascending = 0;
  return removed;
}

PropertyValue* PropertyValue::slot(const HashedKey& key) noexcept {
  if (!is_dictionary() || !make_unique(PropertyKind::dictionary)) return nullptr;
  Entry* entry = find_entry(dictionary_of(word_), key);
  return entry == nullptr ? nullptr : reinterpret_cast<PropertyValue*>(&entry->value);
}

}  // namespace quorvel
