#include "store/data_ark.h"

#include "log/daemon_log.h"
#include "store/data_ark_record.h"

namespace quorvel {

namespace {

// A new key joins the classes of its domain. The classes it joined are added to `joined`; false when memory runs out.
bool inherit_classes(DataArk& ark, const StoreKey& key, unsigned& joined) noexcept QUORVEL_REQUIRES(ark.lock) {
  if (!key.has_key()) return true;
  const HashedKey domain(key.domain_text());
  for (unsigned i = 0; i < kClassCount; ++i) {
    if (!ark.is_in_class(domain, i) || ark.is_in_class(key.hashed(), i)) continue;
    if (!ark.add_to_class(key.hashed(), i)) return false;
    joined |= 1u << i;
  }
  return true;
}

void leave_classes(DataArk& ark, const StoreKey& key, unsigned which) noexcept QUORVEL_REQUIRES(ark.lock) {
  for (unsigned i = 0; i < kClassCount; ++i) {
    if ((which & 1u << i) != 0) static_cast<void>(ark.classes[i].remove(key.hashed()));
  }
}

// Adds an entry that is not there. False, and nothing changed, when memory runs out.
bool insert(DataArk& ark, const StoreKey& key, const PropertyValue& value) noexcept QUORVEL_REQUIRES(ark.lock) {
  unsigned joined = 0;
  if (inherit_classes(ark, key, joined) && ark.values.set(key.hashed(), value)) return true;
  leave_classes(ark, key, joined);
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
  if (!ark->values) ark->values = PropertyValue::dictionary();
  if (!ark->values) return -1;
  bool changed = true;
  if (PropertyValue* slot = ark->values.slot(store_key.hashed())) {
    changed = !(*slot == value);
    std::swap(*slot, stored);
  } else if (!insert(*ark, store_key, value)) {
    return -1;
  }
  post_set_events(*ark, store_key, changed);
  if (changed && !ark->is_unsaved(store_key.hashed()) && !ark->is_in_class(store_key.hashed(), kQuietSetClass)) {
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
  const bool counts = !ark->is_unsaved(store_key.hashed());
  if (clear_classes == 1) leave_classes(*ark, store_key, (1u << kClassCount) - 1);
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
