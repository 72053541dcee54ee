#include "platform/notification_center.h"
#include "store/data_ark.h"
#include "store/data_ark_record.h"

namespace quorvel {

namespace {

// In the order in which a registration records them.
constexpr struct {
  DataArkEvent bit;
  Registry registry;
} kEvents[] = {{kEventChanged, kOnChanged}, {kEventSet, kOnSet}, {kEventRemoved, kOnRemoved}};

}  // namespace

void post_system_notification(const PropertyValue& name) noexcept { platform::post_notification(name, name); }

void DataArk::post(Registry event, const HashedKey& key) const noexcept {
  const PropertyValue& name = registries[event].get(key);
  if (name) post_system_notification(name);
}

int data_ark_register_notification(DataArk* ark, const PropertyValue& domain, const PropertyValue& key,
                                   const PropertyValue& name, unsigned events) noexcept {
  const StoreKey store_key(domain, key);
  if (!store_key) return -1;
  const LockHold hold(ark->lock);
  for (const auto& event : kEvents) {
    if ((events & event.bit) == 0) continue;
    PropertyValue& registry = ark->registries[event.registry];
    if (!registry) registry = PropertyValue::dictionary();
    if (!registry.set(store_key.hashed(), name)) return -1;
  }
  return 0;
}

}  // namespace quorvel
