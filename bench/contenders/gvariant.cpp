#include "bench/contenders/gvariant.h"

namespace quorvel::bench {
namespace {

struct ToVariant {
  GVariant* operator()(const std::string& text) const { return g_variant_new_string(text.c_str()); }
  GVariant* operator()(std::int64_t number) const { return g_variant_new_int64(number); }
  GVariant* operator()(bool truth) const { return g_variant_new_boolean(truth); }
  GVariant* operator()(const Bytes& bytes) const {
    // Known to be well formed: it would be compared as a printed text otherwise.
    gpointer copy = g_memdup2(bytes.data(), bytes.size());
    return g_variant_new_from_data(G_VARIANT_TYPE_BYTESTRING, copy, bytes.size(), TRUE, g_free, copy);
  }
  GVariant* operator()(const Date& date) const { return g_variant_new_double(date.seconds); }
  GVariant* operator()(const Array& elements) const {
    GVariantBuilder builder;
    g_variant_builder_init(&builder, G_VARIANT_TYPE("av"));
    for (const Value& element : elements) g_variant_builder_add(&builder, "v", std::visit(*this, element.content));
    return g_variant_builder_end(&builder);
  }
  GVariant* operator()(const Dictionary& members) const {
    GVariantBuilder builder;
    g_variant_builder_init(&builder, G_VARIANT_TYPE_VARDICT);
    for (const auto& [key, value] : members) {
      g_variant_builder_add(&builder, "{sv}", key.c_str(), std::visit(*this, value.content));
    }
    return g_variant_builder_end(&builder);
  }
};

Value from_children(GVariant* variant) {
  const bool is_dictionary = g_variant_is_of_type(variant, G_VARIANT_TYPE_VARDICT);
  Array array;
  Dictionary dictionary;
  for (gsize i = 0; i < g_variant_n_children(variant); ++i) {
    const Variant child(g_variant_get_child_value(variant, i));
    if (is_dictionary) {
      const Variant key(g_variant_get_child_value(child.get(), 0));
      const Variant boxed(g_variant_get_child_value(child.get(), 1));
      const Variant value(g_variant_get_variant(boxed.get()));
      dictionary.push_back({g_variant_get_string(key.get(), nullptr), from_variant(value.get())});
    } else {
      const Variant value(g_variant_get_variant(child.get()));
      array.push_back(from_variant(value.get()));
    }
  }
  return is_dictionary ? Value{dictionary} : Value{array};
}

}  // namespace

Variant to_variant(const Value& value) { return share(std::visit(ToVariant{}, value.content)); }

Value from_variant(GVariant* variant) {
  switch (g_variant_classify(variant)) {
    case G_VARIANT_CLASS_STRING: return {std::string(g_variant_get_string(variant, nullptr))};
    case G_VARIANT_CLASS_INT64: return {std::int64_t{g_variant_get_int64(variant)}};
    case G_VARIANT_CLASS_BOOLEAN: return {g_variant_get_boolean(variant) != FALSE};
    case G_VARIANT_CLASS_DOUBLE: return {Date{g_variant_get_double(variant)}};
    default: break;
  }
  if (!g_variant_is_of_type(variant, G_VARIANT_TYPE_BYTESTRING)) return from_children(variant);
  gsize count = 0;
  const auto* bytes = static_cast<const std::uint8_t*>(g_variant_get_fixed_array(variant, &count, 1));
  return {Bytes(bytes, bytes + count)};
}

}  // namespace quorvel::bench
