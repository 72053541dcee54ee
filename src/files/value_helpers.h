// Small helpers over values that the folders above share. Any thread may call everything here.
#pragma once

#include <cstddef>

#include "property/value.h"

namespace quorvel {

/// A mutable copy of a dictionary or data value that takes its place. Ends the process with status 255 when `value` is
/// of another kind or the copy cannot be made.
[[nodiscard]] PropertyValue make_mutable(PropertyValue value) noexcept;

using DictionaryCallback = void (*)(const PropertyValue& key, const PropertyValue& value, void* context) noexcept;

/// Calls `callback` once for every entry that `dictionary` holds at the time of the call, in its order, whatever the
/// callback does to the dictionary.
void dict_for_each(const PropertyValue& dictionary, DictionaryCallback callback, void* context) noexcept;

/// Releases what `value` holds, if it holds anything.
void release_if_not_null(PropertyValue& value) noexcept;

/// `value` itself, borrowed, when it is a string; otherwise no value.
[[nodiscard]] const PropertyValue& as_string(const PropertyValue& value) noexcept;

/// Writes the mobile user's home, "/private/var/mobile", into a buffer of `kPathSize` bytes.
void mobile_home_path(char* buffer) noexcept;

}  // namespace quorvel
