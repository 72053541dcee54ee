// nlohmann's json, with CBOR as its encoding: the one that keeps integers, data and texts apart.
#pragma once

#include <cstring>
#include <nlohmann/json.hpp>
#include <span>

#include "bench/data_set.h"

namespace quorvel::bench {

class NlohmannCodec {
 public:
  static constexpr std::string_view kName = "nlohmann";
  using Json = nlohmann::json;
  using Decoded = Json;
  using Encoded = std::vector<std::uint8_t>;

  static Decoded make(const DataSet& data) {
    Json json = Json::object();
    for (const Entry& entry : data) json[entry.store_key] = std::visit(ToJson{}, entry.value.content);
    return json;
  }
  static Encoded encode(const Decoded& json) { return Json::to_cbor(json); }
  static std::span<const std::byte> bytes(const Encoded& encoded) { return std::as_bytes(std::span(encoded)); }
  static Decoded decode(std::span<const std::byte> bytes) {
    const auto* first = reinterpret_cast<const std::uint8_t*>(bytes.data());
    return Json::from_cbor(first, first + bytes.size());
  }
  static std::size_t size(const Decoded& json) { return json.size(); }
  static bool matches(const Decoded& json, const DataSet& data) {
    if (json.size() != data.size()) return false;
    for (const Entry& entry : data) {
      const auto found = json.find(entry.store_key);
      if (found == json.end() || from_json(*found) != entry.value) return false;
    }
    return true;
  }

 private:
  struct ToJson {
    Json operator()(const std::string& text) const { return text; }
    Json operator()(std::int64_t number) const { return number; }
    Json operator()(bool truth) const { return truth; }
    Json operator()(const Bytes& bytes) const { return Json::binary(bytes); }
    Json operator()(const Date& date) const { return date.seconds; }
    Json operator()(const Array& elements) const {
      Json json = Json::array();
      for (const Value& element : elements) json.push_back(std::visit(*this, element.content));
      return json;
    }
    Json operator()(const Dictionary& members) const {
      Json json = Json::object();
      for (const auto& [key, value] : members) json[key] = std::visit(*this, value.content);
      return json;
    }
  };

  static Value from_json(const Json& json) {
    switch (json.type()) {
      case Json::value_t::string: return {json.get<std::string>()};
      case Json::value_t::boolean: return {json.get<bool>()};
      case Json::value_t::binary: return {Bytes(json.get_binary())};
      case Json::value_t::number_float: return {Date{json.get<double>()}};
      case Json::value_t::array: {
        Array array;
        for (const Json& element : json) array.push_back(from_json(element));
        return {array};
      }
      case Json::value_t::object: {
        Dictionary dictionary;
        for (const auto& [key, member] : json.items()) dictionary.push_back({key, from_json(member)});
        return {dictionary};
      }
      default: return {json.get<std::int64_t>()};
    }
  }
};

}  // namespace quorvel::bench
