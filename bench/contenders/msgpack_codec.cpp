#include "bench/contenders/msgpack_codec.h"

#include <cstring>
#include <stdexcept>

namespace quorvel::bench {
namespace {

using Packer = msgpack::packer<msgpack::sbuffer>;

// Dates are an extension of eight bytes.
constexpr std::int8_t kDateType = 1;

struct Pack {
  Packer& packer;

  void operator()(const std::string& text) const { packer.pack(text); }
  void operator()(std::int64_t number) const { packer.pack(number); }
  void operator()(bool truth) const { packer.pack(truth); }
  void operator()(const Bytes& bytes) const {
    packer.pack_bin(static_cast<std::uint32_t>(bytes.size()));
    packer.pack_bin_body(reinterpret_cast<const char*>(bytes.data()), static_cast<std::uint32_t>(bytes.size()));
  }
  void operator()(const Date& date) const {
    packer.pack_ext(sizeof date.seconds, kDateType);
    packer.pack_ext_body(reinterpret_cast<const char*>(&date.seconds), sizeof date.seconds);
  }
  void operator()(const Array& elements) const {
    packer.pack_array(static_cast<std::uint32_t>(elements.size()));
    for (const Value& element : elements) std::visit(*this, element.content);
  }
  void operator()(const Dictionary& members) const {
    packer.pack_map(static_cast<std::uint32_t>(members.size()));
    for (const auto& [key, value] : members) {
      packer.pack(key);
      std::visit(*this, value.content);
    }
  }
};

Value from_object(const msgpack::object& object) {
  switch (object.type) {
    case msgpack::type::STR: return {object.as<std::string>()};
    case msgpack::type::POSITIVE_INTEGER:
    case msgpack::type::NEGATIVE_INTEGER: return {object.as<std::int64_t>()};
    case msgpack::type::BOOLEAN: return {object.via.boolean};
    case msgpack::type::BIN: return {Bytes(object.via.bin.ptr, object.via.bin.ptr + object.via.bin.size)};
    case msgpack::type::EXT: {
      Date date{};
      std::memcpy(&date.seconds, object.via.ext.data(), sizeof date.seconds);
      return {date};
    }
    case msgpack::type::ARRAY: {
      Array array;
      for (const msgpack::object& element : std::span(object.via.array.ptr, object.via.array.size)) {
        array.push_back(from_object(element));
      }
      return {array};
    }
    case msgpack::type::MAP: {
      Dictionary dictionary;
      for (const msgpack::object_kv& member : std::span(object.via.map.ptr, object.via.map.size)) {
        dictionary.push_back({member.key.as<std::string>(), from_object(member.val)});
      }
      return {dictionary};
    }
    default: throw std::runtime_error("a value of no kind in the data");
  }
}

}  // namespace

MsgpackCodec::Decoded MsgpackCodec::make(const DataSet& data) {
  msgpack::sbuffer buffer;
  Packer packer(buffer);
  packer.pack_map(static_cast<std::uint32_t>(data.size()));
  for (const Entry& entry : data) {
    packer.pack(entry.store_key);
    std::visit(Pack{packer}, entry.value.content);
  }
  return decode(bytes(buffer));
}

MsgpackCodec::Encoded MsgpackCodec::encode(const Decoded& tree) {
  msgpack::sbuffer buffer;
  encode_again(tree, buffer);
  return buffer;
}

void MsgpackCodec::encode_again(const Decoded& tree, Encoded& used) {
  used.clear();
  msgpack::pack(used, *tree.objects);
}

std::span<const std::byte> MsgpackCodec::bytes(const Encoded& encoded) {
  return std::as_bytes(std::span(encoded.data(), encoded.size()));
}

MsgpackCodec::Decoded MsgpackCodec::decode(std::span<const std::byte> bytes) {
  Decoded tree{msgpack::unpack(reinterpret_cast<const char*>(bytes.data()), bytes.size()), {}};
  const std::span members(tree.objects->via.map.ptr, tree.objects->via.map.size);
  tree.index.reserve(members.size());
  for (const msgpack::object_kv& member : members) {
    tree.index.emplace(std::string_view(member.key.via.str.ptr, member.key.via.str.size), &member.val);
  }
  return tree;
}

bool MsgpackCodec::matches(const Decoded& tree, const DataSet& data) {
  if (tree.index.size() != data.size()) return false;
  for (const Entry& entry : data) {
    const auto found = tree.index.find(entry.store_key);
    if (found == tree.index.end() || from_object(*found->second) != entry.value) return false;
  }
  return true;
}

}  // namespace quorvel::bench
