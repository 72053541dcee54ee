// Files of the device, read and replaced whole.
#pragma once

#include <optional>
#include <string>

#include "property/value.h"

namespace quorvel::tools {

enum class Place { device, anywhere };

/// The bytes behind a descriptor up to its end; throws Failure naming `path` when they cannot be had.
[[nodiscard]] std::string read_all(int descriptor, const std::string& path, Place place = Place::device);

enum class Links { followed, refused };

/// The property list in the device's file `path`, or nothing when there is no such file. Throws Failure when it cannot
/// be read, is no property list (`consequence` then ends the message), or is a link where links are refused.
[[nodiscard]] std::optional<PropertyValue> read_device_plist(const std::string& path, Links links = Links::followed,
                                                             const std::string& consequence = {});

/// The property list that `bytes` hold; throws Failure naming `path` and ending with `consequence` otherwise.
[[nodiscard]] PropertyValue parse_plist(const std::string& bytes, const std::string& path,
                                        const std::string& consequence = {});

/// True when the device root is the machine's own /: the daemon is then an installed service.
[[nodiscard]] bool is_installed_system();

/// A path of the device as an ordinary path, quoted for a shell.
[[nodiscard]] std::string ordinary_path(const std::string& device_path);

/// How the daemon's service is had: "Start quorveld with: systemctl …", or with the same device root.
[[nodiscard]] std::string how_to_start(const std::string& program);

/// The binary property list of `value`; throws Failure when it cannot be encoded.
[[nodiscard]] std::string plist_bytes(const PropertyValue& value);

/// Writes all of `bytes`; throws Failure naming `path`.
void write_all(int descriptor, const std::string& bytes, const std::string& path, Place place = Place::device);

/// Makes a directory of the device and the directories that lead to it where they are missing.
void make_device_directories(const std::string& path);

/// "cannot VERB PATH: reason", with a hint where the reason suggests one, as a Failure with kUnreachable. A path of the
/// device depends on the device root, an ordinary one does not.
[[noreturn]] void fail_on(const std::string& verb, const std::string& path, Place place = Place::device);

}  // namespace quorvel::tools
