// What the daemon's own code takes part in.
#include <memory>

#include "bench/cases/codec_cases.h"
#include "bench/cases/store_cases.h"
#include "bench/contenders/quorvel_codec.h"
#include "store/data_ark.h"
#include "store/data_ark_record.h"
#include "store/standard_key_classes.h"

namespace quorvel::bench {
namespace {

/// The data ark as start-up leaves it, with every key of a class whose changes do not count.
class ArkStore {
 public:
  static constexpr std::string_view kName = kOurs;
  using Name = PropertyValue;
  using Stored = PropertyValue;
  using View = PropertyValue;

  ArkStore() : ark_(data_ark_load()) { apply_standard_key_classes(ark_.get()); }

  static Name name(const std::string& text) { return PropertyValue::string(text); }
  static Stored stored(const Value& value) { return to_property(value); }
  static Value restored(const Stored& value) { return from_property(value); }

  void prepare(const Name& domain, const Name& key) {
    data_ark_add_to_class(ark_.get(), domain, key, kMemoryOnlyClass);
  }
  bool set(const Name& domain, const Name& key, const Stored& value) {
    return data_ark_set(ark_.get(), domain, key, value) == 0;
  }
  [[nodiscard]] Stored copy(const Name& domain, const Name& key) const {
    return data_ark_copy(ark_.get(), domain, key);
  }
  [[nodiscard]] bool exists(const Name& domain, const Name& key) const {
    return data_ark_exists(ark_.get(), domain, key) == 1;
  }
  [[nodiscard]] View view(const Name& domain) const { return data_ark_copy(ark_.get(), domain, nullptr); }
  static std::size_t view_size(const View& view) { return view.size(); }
  static bool view_finds(const View& view, const Name& key) { return static_cast<bool>(view.get(key.text())); }

 private:
  std::unique_ptr<DataArk> ark_;
};

bool register_all() {
  for (const std::size_t entries : kGrowthSizes) {
    register_codec<QuorvelCodec>(entries);
    register_release<QuorvelCodec>(entries);
  }
  return register_encode_again<QuorvelCodec>() && register_store<ArkStore>() && register_store_growth<ArkStore>();
}

[[maybe_unused]] const bool registered = register_all();

}  // namespace
}  // namespace quorvel::bench
