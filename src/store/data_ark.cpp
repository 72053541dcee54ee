#include "store/data_ark.h"

#include "log/daemon_log.h"
#include "property/walk.h"
#include "store/data_ark_record.h"

namespace quorvel {

namespace {

// What the class marks say about a store key: the key's text as they hold it, none when they do not, and the classes it
// is in. Good until the marks change.
struct Marks {
  const PropertyValue* key = nullptr;
  unsigned classes = 0;
};

Marks marks_of(const DataArk& ark, const HashedKey& key) noexcept QUORVEL_REQUIRES(ark.lock) {
  const DictionaryEntry entry = ark.class_marks.find(key);
  return {&entry.key, DataArk::classes_in(entry.value)};
}

// Adds an entry that is not there; its key joins the classes of its domain, which `marks` then tells as well. A key
// that the marks hold is shared with them, so that its text is in memory once. False, and nothing changed, when memory
// runs out.
bool insert(DataArk& ark, const StoreKey& key, PropertyValue value, Marks& marks) noexcept QUORVEL_REQUIRES(ark.lock) {
  unsigned joined = 0;
  if (key.has_key() && ark.class_marks.size() > 0) joined = ark.classes_of(key.domain_text()) & ~marks.classes;
  if (joined != 0) {
    if (!ark.add_to_classes(key.hashed(), joined)) return false;
    marks = marks_of(ark, key.hashed());
  }
  if (ark.values.add(key.hashed(), *marks.key, std::move(value))) return true;
  if (joined != 0) ark.remove_from_classes(key.hashed(), joined);
  return false;
}

// A save puts every value into one dictionary: one that breaks a limit there would keep all others from being saved.
bool can_be_saved(const PropertyValue& value) noexcept { return !value.is_container() || is_within_limits(value, 1); }

void post_set_events(const DataArk& ark, const StoreKey& key, bool changed) noexcept QUORVEL_REQUIRES(ark.lock) {
  if (!ark.registries[kOnChanged] && !ark.registries[kOnSet]) return;
  const HashedKey domain(key.domain_text());
  if (changed) {
    ark.post(kOnChanged, key.hashed());
    ark.post(kOnChanged, domain);
  }
  ark.post(kOnSet, key.hashed());
  ark.post(kOnSet, domain);
}

}  // namespace

int data_ark_set(DataArk* ark, const PropertyValue& domain, const PropertyValue& key,
                 const PropertyValue& value) noexcept {
  if (!value) {
    daemon_log(0, "data_ark_set", "data_ark_set: value is NULL");
    return -1;
  }
  const StoreKey store_key(domain, key);
  if (!store_key) return -1;
  if (!can_be_saved(value)) {
    daemon_log(0, "data_ark_set", "value of %s is nested too deep or repeats too much to be saved", store_key.text());
    return -1;
  }
  PropertyValue stored(value);  // becomes the old value, which ends after the lock is given back
  const LockHold hold(ark->lock);
  const bool is_first = !ark->values;
  if (is_first) ark->values = PropertyValue::dictionary();
  if (!ark->values) return -1;
  PropertyValue* const slot = ark->values.slot(store_key.hashed());
  const bool changed = slot == nullptr || !(*slot == value);
  Marks marks = changed ? marks_of(*ark, store_key.hashed()) : Marks{};
  if (slot != nullptr) {
    std::swap(*slot, stored);
  } else if (!insert(*ark, store_key, std::move(stored), marks)) {
    if (is_first) ark->values = nullptr;
    return -1;
  }
  post_set_events(*ark, store_key, changed);
  if (changed && (marks.classes & kUncountedSet) == 0) {
    daemon_log(0, "data_ark_set", "dirtied by changing %s", store_key.text());
    ++ark->change_count;
  }
  return 0;
}

int data_ark_remove_extended(DataArk* ark, const PropertyValue& domain, const PropertyValue& key,
                             int clear_classes) noexcept {
  const StoreKey store_key(domain, key);
  if (!store_key) return -1;
  PropertyValue removed;
  const LockHold hold(ark->lock);
  if (!ark->values) return -1;
  if (!ark->values.get(store_key.hashed())) return 0;
  removed = ark->values.remove(store_key.hashed());
  const bool counts = (ark->classes_of(store_key.hashed()) & kUnsaved) == 0;
  if (clear_classes == 1) ark->remove_from_classes(store_key.hashed(), kAllClasses);
  ark->post(kOnRemoved, store_key.hashed());
  if (counts) {
    if (extended_logging != 0) {
      daemon_log(0, "data_ark_remove_extended", "dirtied by removing %s", store_key.text());
    }
    ++ark->change_count;
  }
  return 0;
}

int data_ark_remove(DataArk* ark, const PropertyValue& domain, const PropertyValue& key) noexcept {
  return data_ark_remove_extended(ark, domain, key, 1);
}

int data_ark_exists(DataArk* ark, const PropertyValue& domain, const PropertyValue& key) noexcept {
  const StoreKey store_key(domain, key);
  if (!store_key) return 0;
  const LockHold hold(ark->lock);
  return ark->values.get(store_key.hashed()) ? 1 : 0;
}

}  // namespace quorvel
