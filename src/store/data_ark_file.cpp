#include <fcntl.h>

#include <cerrno>
#include <new>

#include "files/error_text.h"
#include "files/property_list_file.h"
#include "files/value_helpers.h"
#include "log/daemon_log.h"
#include "log/log_writer.h"
#include "platform/descriptor.h"
#include "platform/device_paths.h"
#include "platform/error_output.h"
#include "platform/file_system.h"
#include "store/data_ark.h"
#include "store/data_ark_record.h"

namespace quorvel {

namespace {

// True unless the path certainly names nothing: a dangling link, and whatever cannot be looked at, count as something.
bool something_is_there(const char* path) noexcept {
  const Descriptor object(platform::open_file(path, O_PATH | O_NOFOLLOW, 0));
  return object || (errno != ENOENT && errno != ENOTDIR);
}

// Finds the entries that a save does not write. False when memory runs out.
bool find_unsaved_entries(const DataArk& ark, OmittedEntries& unsaved) noexcept QUORVEL_REQUIRES(ark.lock) {
  for (const auto& [key, marks] : ark.class_marks.entries()) {
    const bool is_unsaved = (DataArk::classes_in(marks) & kUnsaved) != 0;
    if (is_unsaved && !unsaved.add(ark.values, key.text())) return false;
  }
  return true;
}

// Moves the file that could not be loaded out of the way of its replacement. False when that fails.
bool set_aside(DataArk& ark) noexcept QUORVEL_REQUIRES(ark.lock) {
  if (!something_is_there(paths::kDataFile)) {
    ark.file_is_unreadable = false;
    return true;
  }
  int result = platform::rename_file(paths::kDataFile, paths::kDataFileSetAside);
  // A directory does not replace an older file by itself.
  if (result != 0 && errno == ENOTDIR && platform::remove_file(paths::kDataFileSetAside) == 0) {
    result = platform::rename_file(paths::kDataFile, paths::kDataFileSetAside);
  }
  if (result != 0) {
    daemon_log(0, "data_ark_store", "Could not set %s aside as %s: %s", paths::kDataFile, paths::kDataFileSetAside,
               ErrorText().text());
    return false;
  }
  daemon_log(0, "data_ark_store", "%s could not be loaded, set it aside as %s", paths::kDataFile,
             paths::kDataFileSetAside);
  ark.file_is_unreadable = false;
  return true;
}

// Removes the data file, if there is one. False when the removal may not outlast a power cut.
bool remove_data_file(const DataArk& ark) noexcept QUORVEL_REQUIRES(ark.lock) {
  if (ark.file_is_unreadable) {
    daemon_log(0, "data_ark_store", "%s could not be loaded, left it where it is", paths::kDataFile);
    return true;
  }
  if (platform::remove_file(paths::kDataFile) != 0 || platform::flush_directory(paths::kStateDirectory) == 0)
    return true;
  daemon_log(0, "data_ark_store", "Could not store %s", paths::kDataFile);
  return false;
}

// Writes the data file anew. False when the entries are not in it for good.
bool replace_data_file(DataArk& ark, const OmittedEntries& unsaved) noexcept QUORVEL_REQUIRES(ark.lock) {
  if (store_dict_durably(paths::kTemporaryDataFile, ark.values, unsaved) != 0) {
    daemon_log(0, "data_ark_store", "Could not store %s", paths::kTemporaryDataFile);
    // Half of a file may hold the last blocks of a full disk.
    platform::remove_file(paths::kTemporaryDataFile);
    return false;
  }
  if (ark.file_is_unreadable && !set_aside(ark)) return false;
  if (platform::rename_file(paths::kTemporaryDataFile, paths::kDataFile) != 0) {
    daemon_log(0, "data_ark_store", "Problem renaming %s: %s", paths::kTemporaryDataFile, ErrorText().text());
    return false;
  }
  if (platform::flush_directory(paths::kStateDirectory) != 0) {
    daemon_log(0, "data_ark_store", "Could not store %s", paths::kDataFile);
    return false;
  }
  if (extended_logging != 0) daemon_log(0, "data_ark_store", "saved");
  return true;
}

bool save(DataArk& ark) noexcept {
  const LockHold hold(ark.lock);
  ark.change_count = 0;
  OmittedEntries unsaved;
  if (!find_unsaved_entries(ark, unsaved)) {
    daemon_log(0, "data_ark_store", "Nothing mutable changed!");
    return false;
  }
  return ark.values.size() == unsaved.count() ? remove_data_file(ark) : replace_data_file(ark, unsaved);
}

}  // namespace

DataArk* data_ark_load() noexcept {
  auto* ark = new (std::nothrow) DataArk;
  if (ark == nullptr) return nullptr;
  PropertyValue loaded = load_mutable_dict(paths::kDataFile);
  const LockHold hold(ark->lock);
  if (loaded.is_dictionary()) {
    ark->values = std::move(loaded);
  } else {
    ark->file_is_unreadable = loaded || something_is_there(paths::kDataFile);
    daemon_log(0, "data_ark_load", "Could not load %s", paths::kDataFile);
  }
  return ark;
}

void data_ark_store(DataArk* ark) noexcept {
  if (save(*ark) || log_took_last_line()) return;
  // A disk that takes no save seldom takes the log's line about it.
  constexpr std::string_view kLost = "quorveld: data_ark_store: the data ark could not be saved\n";
  platform::write_error_output(kLost);
}

}  // namespace quorvel
