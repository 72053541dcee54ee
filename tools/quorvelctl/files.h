// Files of the device, read and replaced whole.
#pragma once

#include <optional>
#include <string>

#include "property/value.h"

namespace quorvel::tools {

/// The bytes behind a descriptor up to its end; throws Failure naming `path` when they cannot be had.
[[nodiscard]] std::string read_all(int descriptor, const std::string& path);

/// The property list in the device's file `path`, or nothing when there is no such file. Throws Failure when it cannot
/// be read or is no property list.
[[nodiscard]] std::optional<PropertyValue> read_device_plist(const std::string& path);

/// The property list that `bytes` hold; throws Failure naming `path` otherwise.
[[nodiscard]] PropertyValue parse_plist(const std::string& bytes, const std::string& path);

/// The binary property list of `value`; throws Failure when it cannot be encoded.
[[nodiscard]] std::string plist_bytes(const PropertyValue& value);

/// Writes all of `bytes`; throws Failure naming `path`.
void write_all(int descriptor, const std::string& bytes, const std::string& path);

/// Makes a directory of the device and the directories that lead to it where they are missing.
void make_device_directories(const std::string& path);

/// "cannot VERB PATH: reason", with a hint where the reason suggests one, as a Failure with kUnreachable.
[[noreturn]] void fail_on(const std::string& verb, const std::string& path);

}  // namespace quorvel::tools
