#include "support/values.h"

#include <ostream>

#include "property/binary/checked_bytes.h"
#include "property/byte_buffer.h"
#include "property/description.h"
#include "property/unicode.h"

namespace quorvel {
namespace test {

PropertyValue dictionary(std::initializer_list<std::pair<std::string_view, Value>> entries) {
  PropertyValue result = PropertyValue::dictionary(entries.size());
  for (const auto& [key, value] : entries)
    if (!result.set(key, value.value())) throw std::runtime_error("no entry could be made for " + std::string(key));
  return result;
}

PropertyValue array(std::initializer_list<Value> elements) {
  PropertyValue result = PropertyValue::array(elements.size());
  for (const Value& element : elements)
    if (!result.append(element.value())) throw std::runtime_error("an array element could not be made");
  return result;
}

PropertyValue text(std::string_view utf8) { return PropertyValue::string(utf8); }

PropertyValue data(std::string_view bytes) {
  return PropertyValue::data(std::as_bytes(std::span(bytes.data(), bytes.size())));
}

std::string described(const PropertyValue& value) {
  for (std::string room(4096, '\0');; room.resize(room.size() * 2)) {
    TextSink sink(room);
    describe(value, sink);
    if (!sink.full()) return room.substr(0, static_cast<std::size_t>(sink.position() - room.data()));
  }
}

std::string encoded(const PropertyValue& value) {
  ByteBuffer out;
  if (!write_binary(value, out)) throw std::runtime_error("not to be encoded: " + described(value));
  return {reinterpret_cast<const char*>(out.data()), out.size()};
}

const char* round_trip_fault(const PropertyValue& value) {
  if (!(value == value)) return "does not equal itself";
  char room[512];
  TextSink sink(room);
  describe(value, sink);
  if (std::any_of(room, sink.position(), [](char c) { return static_cast<unsigned char>(c) < ' '; }))
    return "breaks its line";
  if (value.is_container() && !(value.mutable_copy() == value)) return "its mutable copy differs";
  ByteBuffer once, twice;
  if (!write_binary(value, once)) return "cannot be written";
  const PropertyValue again = read_binary(once.bytes(), Mutability::mutable_containers);
  if (!again) return "cannot be read again";
  if (!(again == value)) return "differs when it is read again";
  if (!write_binary(again, twice)) return "cannot be written again";
  if (!std::ranges::equal(once.bytes(), twice.bytes())) return "is written in other bytes";
  return nullptr;
}

namespace {

bool has_ascii_keys(const PropertyValue& value) {
  for (std::size_t i = 0; value.kind() == PropertyKind::array && i < value.size(); ++i)
    if (!has_ascii_keys(value.at(i))) return false;
  for (const auto& [key, element] : value.entries())
    if (!is_ascii(key.text()) || !has_ascii_keys(element)) return false;
  return true;
}

}  // namespace

const char* check_fault(std::span<const std::byte> file, bool* accepted) {
  ByteBuffer bytes, written;
  if (!bytes.append(file.data(), file.size())) return "no memory";
  const PropertyValue value = read_binary(bytes.bytes(), Mutability::immutable);
  const CheckedBytes checked = CheckedBytes::check(bytes);
  if (accepted != nullptr) *accepted = static_cast<bool>(checked);
  if (checked && !value.is_dictionary()) return "the check accepts bytes that hold no dictionary";
  if (checked && !std::ranges::equal(checked.bytes(), file)) return "the check changes the bytes";
  if (!checked && !std::ranges::equal(bytes.bytes(), file)) return "the check takes bytes that it refuses";
  if (!value.is_dictionary() || !has_ascii_keys(value)) return nullptr;
  if (!write_binary(value, written)) return "cannot be written";
  return CheckedBytes::check(written) ? nullptr : "the check refuses what the writer writes";
}
const char* round_trip_fault(std::span<const std::byte> file, Mutability mutability) {
  const PropertyValue value = read_binary(file, mutability);
  return value ? round_trip_fault(value) : nullptr;
}

}  // namespace test

void PrintTo(const PropertyValue& value, std::ostream* out) { *out << test::described(value); }

}  // namespace quorvel
