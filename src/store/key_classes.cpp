#include "store/data_ark.h"
#include "store/data_ark_record.h"

namespace quorvel {

bool DataArk::add_to_classes(const HashedKey& key, unsigned classes) noexcept {
  const unsigned before = classes_of(key);
  if ((classes & ~before) == 0) return true;
  if (!class_marks) class_marks = PropertyValue::dictionary();
  PropertyValue marks = PropertyValue::integer(before | classes);
  if (PropertyValue* slot = class_marks.slot(key)) {
    *slot = std::move(marks);
    return true;
  }
  return class_marks.add(key, values.find(key).key, std::move(marks));
}

void DataArk::remove_from_classes(const HashedKey& key, unsigned classes) noexcept {
  const unsigned left = classes_of(key) & ~classes;
  if (left == 0) {
    static_cast<void>(class_marks.remove(key));
  } else if (PropertyValue* marks = class_marks.slot(key)) {
    *marks = PropertyValue::integer(left);
  }
}

int data_ark_add_to_class(DataArk* ark, const PropertyValue& domain, const PropertyValue& key,
                          unsigned key_class) noexcept {
  if (key_class >= kClassCount) return -1;
  const StoreKey store_key(domain, key);
  if (!store_key) return -1;
  const LockHold hold(ark->lock);
  return ark->add_to_classes(store_key.hashed(), class_bit(key_class)) ? 0 : -1;
}

}  // namespace quorvel
