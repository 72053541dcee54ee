// Arrays and dictionaries, and the binary encoding of values.
#include "handles.h"
#include "property/binary/binary.h"
#include "property/unicode.h"

using quorvel::PropertyKind;
using quorvel::PropertyValue;
using namespace quorvel::capi;

namespace {

// Makes `change` to the container behind `handle`, or to a copy that takes its place where it accepts no changes.
template <typename Change>
int change_container(quorvel_value** handle, PropertyKind kind, Change change) noexcept {
  if (handle == nullptr || Lent(*handle)->kind() != kind) return QUORVEL_INVALID_ARGUMENT;
  PropertyValue container = take_over(*handle);
  PropertyValue changed = container.is_mutable() ? std::move(container) : container.mutable_copy();
  const bool done = changed && change(changed);
  // NOLINTNEXTLINE(bugprone-use-after-move): a value that was moved from is none
  *handle = hand_out(done || !container ? std::move(changed) : std::move(container));
  return done ? QUORVEL_OK : QUORVEL_SYSTEM_FAILURE;
}

bool is_key(const char* key) noexcept {
  return key != nullptr && quorvel::check_utf8(key) != quorvel::TextCheck::invalid;
}

}  // namespace

quorvel_value* quorvel_array_new(void) { return hand_out(PropertyValue::array()); }
quorvel_value* quorvel_dictionary_new(void) { return hand_out(PropertyValue::dictionary()); }

size_t quorvel_value_count(const quorvel_value* value) { return Lent(value)->size(); }

const quorvel_value* quorvel_array_get(const quorvel_value* array, size_t index) {
  return lend(Lent(array)->at(index));
}

const quorvel_value* quorvel_dictionary_get(const quorvel_value* dictionary, const char* key) {
  return key != nullptr ? lend(Lent(dictionary)->get(std::string_view(key))) : nullptr;
}

bool quorvel_dictionary_next(const quorvel_value* dictionary, size_t* position, const quorvel_value** key,
                             const quorvel_value** value) {
  const quorvel::detail::Entry* entry = Lent(dictionary)->entries().next(*position);
  if (entry == nullptr) return false;
  if (key != nullptr) *key = lend(quorvel::borrowed(entry->key));
  if (value != nullptr) *value = lend(quorvel::borrowed(entry->value));
  return true;
}

int quorvel_array_append(quorvel_value** container, quorvel_value* value) {
  PropertyValue taken = take_over(value);
  if (!taken) return QUORVEL_INVALID_ARGUMENT;
  return change_container(container, PropertyKind::array,
                          [&](PropertyValue& array) { return array.append(std::move(taken)); });
}

int quorvel_dictionary_set(quorvel_value** container, const char* key, quorvel_value* value) {
  PropertyValue taken = take_over(value);
  if (!taken || !is_key(key)) return QUORVEL_INVALID_ARGUMENT;
  return change_container(container, PropertyKind::dictionary, [&](PropertyValue& dictionary) {
    return dictionary.set(std::string_view(key), std::move(taken));
  });
}

int quorvel_dictionary_remove(quorvel_value** container, const char* key) {
  if (!is_key(key)) return QUORVEL_INVALID_ARGUMENT;
  return change_container(container, PropertyKind::dictionary, [&](PropertyValue& dictionary) {
    return !dictionary.get(std::string_view(key)) || dictionary.remove(std::string_view(key));
  });
}

quorvel_value* quorvel_value_decode(const void* bytes, size_t length) {
  if (bytes == nullptr) return nullptr;
  return hand_out(quorvel::read_binary({static_cast<const std::byte*>(bytes), length}, quorvel::Mutability::immutable));
}

quorvel_value* quorvel_value_encode(const quorvel_value* value) {
  quorvel::ByteBuffer bytes;
  if (!quorvel::write_binary(*Lent(value), bytes)) return nullptr;
  return hand_out(PropertyValue::data(bytes.bytes()));
}
