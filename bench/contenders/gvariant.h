// GLib's values.
#pragma once

#include <glib.h>

#include <memory>

#include "bench/data_set.h"

namespace quorvel::bench {

struct VariantEnd {
  void operator()(GVariant* variant) const { g_variant_unref(variant); }
};
using Variant = std::unique_ptr<GVariant, VariantEnd>;

[[nodiscard]] inline Variant share(GVariant* variant) { return Variant(g_variant_ref_sink(variant)); }
[[nodiscard]] Variant to_variant(const Value& value);
[[nodiscard]] Value from_variant(GVariant* variant);

}  // namespace quorvel::bench
