// Property-list files, read and written whole through the safe open. Any thread may call everything here.
#pragma once

#include "property/binary/checked_bytes.h"
#include "property/binary/omitted_entries.h"

namespace quorvel {

/// Writes `value` to `path` in the binary encoding, in place; a new file has mode 0644, an existing one keeps its own.
/// Returns 0, or -1 after logging why; the file may then hold part of the value.
[[nodiscard]] int store_dict(const char* path, const PropertyValue& value) noexcept;

/// Writes `value`, without its entries that are `omitted`, to a new file of mode 0644 at `path`, in place of whatever
/// file, link or socket stood there, and brings the content to stable storage. Returns 0, or -1 after logging why; part
/// of the file may then be there.
[[nodiscard]] int store_dict_durably(const char* path, const PropertyValue& value,
                                     const OmittedEntries& omitted) noexcept;

/// Reads the file at `path`. Returns the value, of whatever kind the file holds: with nothing in it that accepts
/// changes when `immutable`, else with mutable containers. None after logging why.
[[nodiscard]] PropertyValue _load_dict(const char* path, bool immutable) noexcept;
[[nodiscard]] PropertyValue load_dict(const char* path) noexcept;
[[nodiscard]] PropertyValue load_mutable_dict(const char* path) noexcept;
/// `load_dict` for a caller that only passes a dictionary on: where the file's bytes can be passed on as they are,
/// `bytes` takes them and there is no value.
[[nodiscard]] PropertyValue load_dict_or_bytes(const char* path, CheckedBytes& bytes) noexcept;

}  // namespace quorvel
