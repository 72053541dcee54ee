#include "store/data_ark_file.h"

#include <fcntl.h>

#include <cerrno>
#include <cstdio>
#include <new>

#include "files/error_text.h"
#include "files/property_list_file.h"
#include "files/value_helpers.h"
#include "log/daemon_log.h"
#include "log/log_writer.h"
#include "platform/descriptor.h"
#include "platform/device_paths.h"
#include "platform/error_output.h"
#include "store/data_ark.h"
#include "store/data_ark_record.h"

namespace quorvel {

namespace {

void compose(char (&path)[platform::kPathSize], const char* head, const char* tail) noexcept {
  // The fixed paths come nowhere near the bound.
  static_cast<void>(std::snprintf(path, sizeof path, "%.500s%s", head, tail));
}

// True unless the path certainly names nothing: a dangling link, and whatever cannot be looked at, count as something.
bool something_is_there(const char* path) noexcept {
  const Descriptor object(platform::open_file(path, O_PATH | O_NOFOLLOW, 0));
  return object || (errno != ENOENT && errno != ENOTDIR);
}

// Finds the entries that a save does not write. False when memory runs out.
bool find_unsaved_entries(const DataArk& ark, OmittedEntries& unsaved) noexcept QUORVEL_REQUIRES(ark.lock) {
  for (const auto& [key, marks] : ark.class_marks.entries()) {
    const bool is_unsaved = (static_cast<unsigned>(marks.to_int64().value_or(0)) & kUnsaved) != 0;
    if (is_unsaved && !unsaved.add(ark.values, key.text())) return false;
  }
  return true;
}

// Moves what could not be loaded out of the way of the file that replaces it.
bool set_aside(DataArk& ark, const DataArkPaths& paths) noexcept QUORVEL_REQUIRES(ark.lock) {
  if (!something_is_there(paths.file)) {
    ark.file_is_unreadable = false;
    return true;
  }
  int result = platform::rename_file(paths.file, paths.set_aside);
  // A directory does not replace an older file by itself.
  if (result != 0 && errno == ENOTDIR && platform::remove_file(paths.set_aside) == 0) {
    result = platform::rename_file(paths.file, paths.set_aside);
  }
  if (result != 0) {
    daemon_log(0, "data_ark_store", "Could not set %s aside as %s: %s", paths.file, paths.set_aside,
               ErrorText().text());
    return false;
  }
  daemon_log(0, "data_ark_store", "%s could not be loaded, set it aside as %s", paths.file, paths.set_aside);
  ark.file_is_unreadable = false;
  return true;
}

// Whether the removal, where there was something to remove, will outlast a power cut.
bool remove_data_file(const DataArk& ark, const DataArkPaths& paths) noexcept QUORVEL_REQUIRES(ark.lock) {
  if (ark.file_is_unreadable) {
    daemon_log(0, "data_ark_store", "%s could not be loaded, left it where it is", paths.file);
    return true;
  }
  if (platform::remove_file(paths.file) != 0 || platform::flush_directory(paths.directory) == 0) return true;
  daemon_log(0, "data_ark_store", "Could not store %s", paths.file);
  return false;
}

// False when the entries are not in the data file for good.
bool replace_data_file(DataArk& ark, const DataArkPaths& paths, const OmittedEntries& unsaved) noexcept
    QUORVEL_REQUIRES(ark.lock) {
  if (store_dict_durably(paths.temporary, ark.values, unsaved) != 0) {
    daemon_log(0, "data_ark_store", "Could not store %s", paths.temporary);
    // Half of a file may hold the last blocks of a full disk.
    platform::remove_file(paths.temporary);
    return false;
  }
  if (ark.file_is_unreadable && !set_aside(ark, paths)) return false;
  if (platform::rename_file(paths.temporary, paths.file) != 0) {
    daemon_log(0, "data_ark_store", "Problem renaming %s: %s", paths.temporary, ErrorText().text());
    return false;
  }
  if (platform::flush_directory(paths.directory) != 0) {
    daemon_log(0, "data_ark_store", "Could not store %s", paths.file);
    return false;
  }
  if (extended_logging != 0) daemon_log(0, "data_ark_store", "saved");
  return true;
}

bool save(DataArk& ark, const DataArkPaths& paths) noexcept {
  const LockHold hold(ark.lock);
  ark.change_count = 0;
  OmittedEntries unsaved;
  if (!find_unsaved_entries(ark, unsaved)) {
    daemon_log(0, "data_ark_store", "Nothing mutable changed!");
    return false;
  }
  return ark.values.size() == unsaved.count() ? remove_data_file(ark, paths) : replace_data_file(ark, paths, unsaved);
}

}  // namespace

DataArkPaths::DataArkPaths() noexcept {
  compose(directory, paths::kStateDirectory, "");
  compose(file, directory, "/data_ark.plist");
  compose(temporary, file, ".XXXXXX");
  compose(set_aside, file, ".unreadable");
}

DataArk* data_ark_load() noexcept {
  auto* ark = new (std::nothrow) DataArk;
  if (ark == nullptr) return nullptr;
  const DataArkPaths paths;
  PropertyValue loaded = load_mutable_dict(paths.file);
  const LockHold hold(ark->lock);
  if (loaded.is_dictionary()) {
    ark->values = std::move(loaded);
  } else {
    ark->file_is_unreadable = loaded || something_is_there(paths.file);
    daemon_log(0, "data_ark_load", "Could not load %s", paths.file);
  }
  return ark;
}

void data_ark_store(DataArk* ark) noexcept {
  const DataArkPaths paths;
  if (save(*ark, paths) || log_took_last_line()) return;
  // A disk that takes no save seldom takes the log's line about it.
  constexpr std::string_view kLost = "quorveld: data_ark_store: the data ark could not be saved\n";
  platform::write_error_output(kLost);
}

}  // namespace quorvel
