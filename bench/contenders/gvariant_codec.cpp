#include "bench/contenders/gvariant_codec.h"

namespace quorvel::bench {
namespace {

GVariantCodec::Decoded make_table() {
  return GVariantCodec::Decoded(g_hash_table_new_full(
      g_str_hash, g_str_equal, g_free, [](gpointer value) { g_variant_unref(static_cast<GVariant*>(value)); }));
}

}  // namespace

GVariantCodec::Decoded GVariantCodec::make(const DataSet& data) {
  Decoded table = make_table();
  for (const Entry& entry : data) {
    g_hash_table_insert(table.get(), g_strdup(entry.store_key.c_str()), to_variant(entry.value).release());
  }
  return table;
}

GVariantCodec::Encoded GVariantCodec::encode(const Decoded& table) {
  GVariantBuilder builder;
  g_variant_builder_init(&builder, G_VARIANT_TYPE_VARDICT);
  GHashTableIter entry;
  g_hash_table_iter_init(&entry, table.get());
  gpointer key = nullptr, value = nullptr;
  while (g_hash_table_iter_next(&entry, &key, &value)) {
    g_variant_builder_add(&builder, "{sv}", static_cast<const char*>(key), static_cast<GVariant*>(value));
  }
  Variant encoded = share(g_variant_builder_end(&builder));
  static_cast<void>(g_variant_get_data(encoded.get()));
  return encoded;
}

std::span<const std::byte> GVariantCodec::bytes(const Encoded& encoded) {
  return {static_cast<const std::byte*>(g_variant_get_data(encoded.get())), g_variant_get_size(encoded.get())};
}

GVariantCodec::Decoded GVariantCodec::decode(std::span<const std::byte> bytes) {
  GBytes* copy = g_bytes_new(bytes.data(), bytes.size());
  const Variant whole = share(g_variant_new_from_bytes(G_VARIANT_TYPE_VARDICT, copy, FALSE));
  g_bytes_unref(copy);
  Decoded table = make_table();
  GVariantIter entry;
  g_variant_iter_init(&entry, whole.get());
  char* key = nullptr;
  GVariant* value = nullptr;
  while (g_variant_iter_next(&entry, "{sv}", &key, &value)) g_hash_table_insert(table.get(), key, value);
  return table;
}

bool GVariantCodec::matches(const Decoded& table, const DataSet& data) {
  if (size(table) != data.size()) return false;
  for (const Entry& entry : data) {
    auto* value = static_cast<GVariant*>(g_hash_table_lookup(table.get(), entry.store_key.c_str()));
    if (value == nullptr || from_variant(value) != entry.value) return false;
  }
  return true;
}

}  // namespace quorvel::bench
