#include "store/data_ark.h"
#include "store/data_ark_record.h"

namespace quorvel {

bool DataArk::add_to_class(const HashedKey& key, unsigned key_class) noexcept {
  PropertyValue& members = classes[key_class];
  if (!members) members = PropertyValue::dictionary();
  return members.get(key) || members.set(key, PropertyValue::boolean(true));
}

int data_ark_add_to_class(DataArk* ark, const PropertyValue& domain, const PropertyValue& key,
                          unsigned key_class) noexcept {
  if (key_class >= kClassCount) return -1;
  const StoreKey store_key(domain, key);
  if (!store_key) return -1;
  const LockHold hold(ark->lock);
  return ark->add_to_class(store_key.hashed(), key_class) ? 0 : -1;
}

}  // namespace quorvel
