// The data ark's file, and the limit: the same bytes written and renamed, or read, and nothing else.
#include <cstring>
#include <memory>
#include <vector>

#include "bench/cases/file_cases.h"
#include "bench/contenders/quorvel_codec.h"
#include "bench/support/scratch_root.h"
#include "store/data_ark.h"
#include "store/data_ark_record.h"
#include "store/standard_key_classes.h"

namespace quorvel::bench {
namespace {

using Ark = std::unique_ptr<DataArk>;

/// A data ark as start-up makes it from a file with the data.
class ArkSaver {
 public:
  explicit ArkSaver(std::size_t entries)
      : data_(data_set(entries)), encoded_(QuorvelCodec::encode(to_property(data_))) {
    use();
    ark_ = load();
    apply_standard_key_classes(ark_.get());
  }

  // There is one data file for all sizes.
  void use() const { write_file(file(), encoded_.bytes()); }
  void save() const { data_ark_store(ark_.get()); }
  [[nodiscard]] static std::filesystem::path file() { return scratch_root().data_file(); }
  [[nodiscard]] static Ark nothing() { return nullptr; }
  [[nodiscard]] static Ark load() { return Ark(data_ark_load()); }
  [[nodiscard]] bool looks_whole(const Ark& ark) const { return is_stored(*ark, data_.back()); }
  [[nodiscard]] bool matches(const Ark& ark) const {
    for (const Entry& entry : data_) {
      if (!is_stored(*ark, entry)) return false;
    }
    return true;
  }

 private:
  static bool is_stored(DataArk& ark, const Entry& entry) {
    const PropertyValue value =
        data_ark_copy(&ark, PropertyValue::string(entry.domain), PropertyValue::string(entry.key));
    return value && from_property(value) == entry.value;
  }

  const DataSet& data_;
  ByteBuffer encoded_;
  Ark ark_;
};

class BareSaver {
 public:
  explicit BareSaver(std::size_t entries)
      : encoded_(QuorvelCodec::encode(to_property(data_set(entries)))), room_(encoded_.size()) {}

  void use() const {}
  void save() const { replace_file(file(), encoded_.bytes(), Flushing::none); }
  [[nodiscard]] static std::filesystem::path file() { return scratch_root().outside() / "bare"; }
  [[nodiscard]] static std::size_t nothing() { return 0; }
  [[nodiscard]] std::size_t load() { return read_file(file(), room_); }
  [[nodiscard]] bool looks_whole(std::size_t count) const { return count == encoded_.size(); }
  [[nodiscard]] bool matches(std::size_t count) const {
    return looks_whole(count) && std::memcmp(room_.data(), encoded_.data(), count) == 0;
  }

 private:
  ByteBuffer encoded_;
  std::vector<std::byte> room_;
};

bool register_all() {
  for (const std::size_t entries : kGrowthSizes) register_files<ArkSaver>(entries, kOurs);
  return register_files<BareSaver>(kSize, kLimit);
}

[[maybe_unused]] const bool registered = register_all();

}  // namespace
}  // namespace quorvel::bench
