#include "bench/support/property_values.h"

#include <stdexcept>

namespace quorvel::bench {
namespace {

void require(bool done) {
  if (!done) throw std::bad_alloc();
}

struct ToProperty {
  PropertyValue operator()(const std::string& text) const { return PropertyValue::string(text); }
  PropertyValue operator()(std::int64_t number) const { return PropertyValue::integer(number); }
  PropertyValue operator()(bool truth) const { return PropertyValue::boolean(truth); }
  PropertyValue operator()(const Bytes& bytes) const { return PropertyValue::data(std::as_bytes(std::span(bytes))); }
  PropertyValue operator()(const Date& date) const { return PropertyValue::date(date.seconds); }
  PropertyValue operator()(const Array& elements) const {
    PropertyValue array = PropertyValue::array(elements.size());
    for (const Value& element : elements) require(array.append(to_property(element)));
    return array;
  }
  PropertyValue operator()(const Dictionary& members) const {
    PropertyValue dictionary = PropertyValue::dictionary(members.size());
    for (const auto& [key, value] : members) require(dictionary.set(std::string_view(key), to_property(value)));
    return dictionary;
  }
};

}  // namespace

PropertyValue to_property(const Value& value) { return std::visit(ToProperty{}, value.content); }

Value from_property(const PropertyValue& value) {
  switch (value.kind()) {
    case PropertyKind::string: return {std::string(value.text())};
    case PropertyKind::integer: return {value.to_int64().value()};
    case PropertyKind::boolean: return {value.to_boolean()};
    case PropertyKind::date: return {Date{value.to_double()}};
    case PropertyKind::data: {
      const auto* first = reinterpret_cast<const std::uint8_t*>(value.bytes().data());
      return {Bytes(first, first + value.bytes().size())};
    }
    case PropertyKind::array: {
      Array array;
      for (std::size_t i = 0; i < value.size(); ++i) array.push_back(from_property(value.at(i)));
      return {array};
    }
    case PropertyKind::dictionary: {
      Dictionary dictionary;
      for (const auto& [key, member] : value.entries())
        dictionary.push_back({std::string(key.text()), from_property(member)});
      return {dictionary};
    }
    default: throw std::runtime_error("a value of no kind in the data");
  }
}

PropertyValue to_property(const DataSet& data) {
  PropertyValue dictionary = PropertyValue::dictionary(data.size());
  for (const Entry& entry : data) {
    require(dictionary.set(std::string_view(entry.store_key), to_property(entry.value)));
  }
  return dictionary;
}

bool matches(const PropertyValue& dictionary, const DataSet& data) {
  if (dictionary.size() != data.size()) return false;
  for (const Entry& entry : data) {
    const PropertyValue& value = dictionary.get(std::string_view(entry.store_key));
    if (!value || from_property(value) != entry.value) return false;
  }
  return true;
}

}  // namespace quorvel::bench
