#include "support/values.h"

#include <ostream>
#include <span>
#include <stdexcept>

#include "platform/property/binary.h"
#include "platform/property/byte_buffer.h"
#include "platform/property/description.h"

namespace quorvel {
namespace test {

PropertyValue dictionary(std::initializer_list<std::pair<std::string_view, Value>> entries) {
  PropertyValue result = PropertyValue::dictionary(entries.size());
  for (const auto& [key, value] : entries) {
    if (!result.set(key, value.value())) throw std::runtime_error("no entry could be made for " + std::string(key));
  }
  return result;
}

PropertyValue array(std::initializer_list<Value> elements) {
  PropertyValue result = PropertyValue::array(elements.size());
  for (const Value& element : elements) {
    if (!result.append(element.value())) throw std::runtime_error("an array element could not be made");
  }
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

}  // namespace test

void PrintTo(const PropertyValue& value, std::ostream* out) { *out << test::described(value); }

}  // namespace quorvel
