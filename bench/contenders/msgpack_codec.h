// msgpack-cxx: a tree of objects in a zone, with the hash index that it needs before a key can be looked up.
#pragma once

#include <absl/container/flat_hash_map.h>

#include <msgpack.hpp>
#include <span>
#include <string_view>

#include "bench/data_set.h"

namespace quorvel::bench {

struct MsgpackTree {
  msgpack::object_handle objects;
  absl::flat_hash_map<std::string_view, const msgpack::object*> index;
};

struct MsgpackCodec {
  static constexpr std::string_view kName = "msgpack-cxx";
  using Decoded = MsgpackTree;
  using Encoded = msgpack::sbuffer;

  static Decoded make(const DataSet& data);
  static Encoded encode(const Decoded& tree);
  static void encode_again(const Decoded& tree, Encoded& used);
  static std::span<const std::byte> bytes(const Encoded& encoded);
  static Decoded decode(std::span<const std::byte> bytes);
  static std::size_t size(const Decoded& tree) { return tree.index.size(); }
  static bool matches(const Decoded& tree, const DataSet& data);
};

}  // namespace quorvel::bench
