// GVariant's own encoding, with each value taken out of it and held in a hash table.
#pragma once

#include <span>

#include "bench/contenders/gvariant.h"

namespace quorvel::bench {

struct TableEnd {
  void operator()(GHashTable* table) const { g_hash_table_unref(table); }
};

struct GVariantCodec {
  static constexpr std::string_view kName = "GVariant";
  using Decoded = std::unique_ptr<GHashTable, TableEnd>;
  using Encoded = Variant;

  static Decoded make(const DataSet& data);
  static Encoded encode(const Decoded& table);
  static std::span<const std::byte> bytes(const Encoded& encoded);
  static Decoded decode(std::span<const std::byte> bytes);
  static std::size_t size(const Decoded& table) { return g_hash_table_size(table.get()); }
  static bool matches(const Decoded& table, const DataSet& data);
};

}  // namespace quorvel::bench
