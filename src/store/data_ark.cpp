#include "store/data_ark.h"

#include "log/daemon_log.h"
#include "store/data_ark_record.h"

namespace quorvel {

namespace {

// Adds an entry that is not there; it joins the classes of its domain, which are added to `classes`, those it is in
// already. `shared` is its key where a mark holds it, so that a marked key has its text in memory once. False, and
// nothing changed, when memory runs out.
bool insert(DataArk& ark, const StoreKey& key, PropertyValue shared, PropertyValue value, unsigned& classes) noexcept
    QUORVEL_REQUIRES(ark.lock) {
  unsigned joined = 0;
  if (key.has_key() && ark.class_marks.size() > 0) joined = ark.classes_of(key.domain_text()) & ~classes;
  if (joined != 0 && !ark.add_to_classes(key.hashed(), joined)) return false;
  classes |= joined;
  if (!shared && joined != 0) shared = ark.class_marks.find(key.hashed()).key;
  if (ark.values.add(key.hashed(), std::move(shared), std::move(value))) return true;
  if (joined != 0) ark.remove_from_classes(key.hashed(), joined);
  return false;
}

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
  PropertyValue stored(value);  // becomes the old value, which ends after the lock is given back
  const LockHold hold(ark->lock);
  const bool is_first = !ark->values;
  if (is_first) ark->values = PropertyValue::dictionary();
  if (!ark->values) return -1;
  PropertyValue* const slot = ark->values.slot(store_key.hashed());
  const bool changed = slot == nullptr || !(*slot == value);
  const PropertyValue none;
  const DictionaryEntry marks = changed ? ark->class_marks.find(store_key.hashed()) : DictionaryEntry{none, none};
  unsigned classes = changed ? DataArk::classes_in(marks.value) : 0;
  if (slot != nullptr) {
    std::swap(*slot, stored);
  } else if (!insert(*ark, store_key, marks.key, std::move(stored), classes)) {
    if (is_first) ark->values = nullptr;
    return -1;
  }
  post_set_events(*ark, store_key, changed);
  if (changed && (classes & kUncountedSet) == 0) {
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
