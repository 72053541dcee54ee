// absl's hash map behind a mutex, from the joined key to a value that is shared, which is never dearer here than one
// that is copied.
#include <absl/container/flat_hash_map.h>
#include <absl/strings/match.h>
#include <absl/strings/str_cat.h>

#include <memory>
#include <mutex>

#include "bench/cases/store_cases.h"

namespace quorvel::bench {
namespace {

class AbslStore {
 public:
  static constexpr std::string_view kName = "absl::flat_hash_map";
  using Name = std::string;
  using Stored = std::shared_ptr<const Value>;
  using View = absl::flat_hash_map<std::string, Stored>;

  static Name name(const std::string& text) { return text; }
  static Stored stored(const Value& value) { return std::make_shared<const Value>(value); }
  static Value restored(const Stored& value) { return *value; }

  void prepare(const Name&, const Name&) {}
  bool set(const Name& domain, const Name& key, const Stored& value) {
    std::string joined = absl::StrCat(domain, "-", key);
    const std::lock_guard hold(mutex_);
    const auto [place, is_new] = values_.try_emplace(std::move(joined), value);
    if (is_new) return true;
    changes_ += *place->second == *value ? 0u : 1u;
    place->second = value;
    return true;
  }
  [[nodiscard]] Stored copy(const Name& domain, const Name& key) const {
    const std::string joined = absl::StrCat(domain, "-", key);
    const std::lock_guard hold(mutex_);
    const auto found = values_.find(joined);
    return found == values_.end() ? Stored() : found->second;
  }
  [[nodiscard]] bool exists(const Name& domain, const Name& key) const {
    const std::string joined = absl::StrCat(domain, "-", key);
    const std::lock_guard hold(mutex_);
    return values_.contains(joined);
  }
  [[nodiscard]] View view(const Name& domain) const {
    const std::string prefix = absl::StrCat(domain, "-");
    View view;
    const std::lock_guard hold(mutex_);
    for (const auto& [key, value] : values_) {
      if (absl::StartsWith(key, prefix)) view.emplace(key.substr(prefix.size()), value);
    }
    return view;
  }
  static std::size_t view_size(const View& view) { return view.size(); }
  static bool view_finds(const View& view, const Name& key) { return view.contains(key); }

 private:
  mutable std::mutex mutex_;
  absl::flat_hash_map<std::string, Stored> values_;
  std::size_t changes_ = 0;
};

[[maybe_unused]] const bool registered = register_store<AbslStore>();

}  // namespace
}  // namespace quorvel::bench
