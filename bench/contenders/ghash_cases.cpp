// GLib's hash table behind a mutex, from the joined key to a GVariant.
#include "bench/cases/store_cases.h"
#include "bench/contenders/gvariant.h"

namespace quorvel::bench {
namespace {

struct TextEnd {
  void operator()(char* text) const { g_free(text); }
};
using Text = std::unique_ptr<char, TextEnd>;
struct TableEnd {
  void operator()(GHashTable* table) const { g_hash_table_unref(table); }
};

void end_variant(gpointer variant) { g_variant_unref(static_cast<GVariant*>(variant)); }

class GHashStore {
 public:
  static constexpr std::string_view kName = "GHashTable";
  using Name = std::string;
  // One pointer with a count, as g_variant_ref gives it.
  using Stored = std::shared_ptr<GVariant>;
  using Table = std::unique_ptr<GHashTable, TableEnd>;

  GHashStore() : values_(make_table()) { g_mutex_init(&mutex_); }
  ~GHashStore() { g_mutex_clear(&mutex_); }
  GHashStore(const GHashStore&) = delete;
  GHashStore& operator=(const GHashStore&) = delete;

  static Name name(const std::string& text) { return text; }
  static Stored stored(const Value& value) { return {to_variant(value).release(), VariantEnd{}}; }
  static Value restored(const Variant& value) { return from_variant(value.get()); }

  void prepare(const Name&, const Name&) {}
  bool set(const Name& domain, const Name& key, const Stored& value) {
    Text joined = join(domain, key);
    const Hold hold(*this);
    const auto* old = static_cast<GVariant*>(g_hash_table_lookup(values_.get(), joined.get()));
    if (old != nullptr) changes_ += g_variant_equal(old, value.get()) ? 0u : 1u;
    g_hash_table_insert(values_.get(), joined.release(), g_variant_ref(value.get()));
    return true;
  }
  [[nodiscard]] Variant copy(const Name& domain, const Name& key) const {
    const Text joined = join(domain, key);
    const Hold hold(*this);
    auto* found = static_cast<GVariant*>(g_hash_table_lookup(values_.get(), joined.get()));
    return Variant(found == nullptr ? nullptr : g_variant_ref(found));
  }
  [[nodiscard]] bool exists(const Name& domain, const Name& key) const {
    const Text joined = join(domain, key);
    const Hold hold(*this);
    return g_hash_table_contains(values_.get(), joined.get()) != FALSE;
  }
  [[nodiscard]] Table view(const Name& domain) const {
    const Text prefix = join(domain, "");
    Table view = make_table();
    const Hold hold(*this);
    GHashTableIter entry;
    g_hash_table_iter_init(&entry, values_.get());
    gpointer key = nullptr, value = nullptr;
    while (g_hash_table_iter_next(&entry, &key, &value)) {
      const auto* text = static_cast<const char*>(key);
      if (g_str_has_prefix(text, prefix.get())) {
        g_hash_table_insert(view.get(), g_strdup(text + domain.size() + 1),
                            g_variant_ref(static_cast<GVariant*>(value)));
      }
    }
    return view;
  }
  static std::size_t view_size(const Table& view) { return g_hash_table_size(view.get()); }
  static bool view_finds(const Table& view, const Name& key) {
    return g_hash_table_contains(view.get(), key.c_str()) != FALSE;
  }

 private:
  class Hold {
   public:
    explicit Hold(const GHashStore& store) : mutex_(store.mutex_) { g_mutex_lock(&mutex_); }
    ~Hold() { g_mutex_unlock(&mutex_); }
    Hold(const Hold&) = delete;
    Hold& operator=(const Hold&) = delete;

   private:
    GMutex& mutex_;
  };

  static Text join(const Name& domain, const Name& key) {
    return Text(g_strconcat(domain.c_str(), "-", key.c_str(), nullptr));
  }
  static Table make_table() { return Table(g_hash_table_new_full(g_str_hash, g_str_equal, g_free, end_variant)); }

  mutable GMutex mutex_;
  Table values_;
  std::size_t changes_ = 0;
};

[[maybe_unused]] const bool registered = register_store<GHashStore>();

}  // namespace
}  // namespace quorvel::bench
