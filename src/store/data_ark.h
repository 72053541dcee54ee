// The data ark: the device's property store. Values are addressed by a domain and a key, held in memory and saved whole
// to one property-list file. docs/data-ark.md describes keys, classes and what is saved when.
//
// Domains and keys are strings or no value; a value of another kind counts as none. Every operation takes the store
// lock for as long as it runs and may be called from any thread.
#pragma once

#include <cstdint>

#include "property/value.h"

namespace quorvel {

class DataArk;

/// Events of `data_ark_register_notification`.
enum DataArkEvent : unsigned { kEventSet = 1, kEventRemoved = 2, kEventChanged = 4 };

/// Reads the data file into a new data ark, which lives as long as the process; one without values when the file could
/// not be used. Null when memory or the lock cannot be had.
[[nodiscard]] DataArk* data_ark_load() noexcept;

/// Saves the entries outside classes 1 and 7, all or nothing; an empty save removes the file.
void data_ark_store(DataArk* ark) noexcept;

/// Stores `value`. Returns 0, or -1 when there is no value, when no save could write it (it is nested too deep or
/// repeats too much) or memory runs out; nothing is changed then.
int data_ark_set(DataArk* ark, const PropertyValue& domain, const PropertyValue& key,
                 const PropertyValue& value) noexcept;

/// Removes an entry, and with `clear_classes` 1 its class marks. Returns 0, also when there is no such entry; -1 when
/// the data ark holds no values at all.
int data_ark_remove_extended(DataArk* ark, const PropertyValue& domain, const PropertyValue& key,
                             int clear_classes) noexcept;
int data_ark_remove(DataArk* ark, const PropertyValue& domain, const PropertyValue& key) noexcept;

/// 1 when the entry is stored, else 0. Keys that are answered live do not count.
[[nodiscard]] int data_ark_exists(DataArk* ark, const PropertyValue& domain, const PropertyValue& key) noexcept;

/// Marks a store key with a class from 0 to 8 (store/key_class.h). Returns 0, or -1 for another class or when memory
/// runs out.
int data_ark_add_to_class(DataArk* ark, const PropertyValue& domain, const PropertyValue& key,
                          unsigned key_class) noexcept;

/// Has `name` posted at the events of the mask `events`; a later name replaces an earlier one. Returns 0, or -1 when
/// memory runs out: of changed, set and removed, in this order, those before the failure are registered.
int data_ark_register_notification(DataArk* ark, const PropertyValue& domain, const PropertyValue& key,
                                   const PropertyValue& name, unsigned events) noexcept;

/// The store key of a domain and a key, joined by a hyphen. None when memory runs out.
[[nodiscard]] PropertyValue data_ark_key(const PropertyValue& domain, const PropertyValue& key) noexcept;

/// The value of a key: live from the device-information service for the keys that describe the device, else the stored
/// value itself, or none. Without a key, a new dictionary of the domain's stored entries under their bare keys; none
/// when the data ark holds no values at all or memory runs out.
[[nodiscard]] PropertyValue data_ark_copy(DataArk* ark, const PropertyValue& domain, const PropertyValue& key) noexcept;

/// Posts `name` on the system notification center, with the name as its object.
void post_system_notification(const PropertyValue& name) noexcept;

}  // namespace quorvel
