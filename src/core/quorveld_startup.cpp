#include "core/quorveld_startup.h"

#include <fcntl.h>
#include <sys/stat.h>

#include <cerrno>

#include "device/telephony_facts.h"
#include "files/error_text.h"
#include "files/safe_open.h"
#include "log/daemon_log.h"
#include "platform/descriptor.h"
#include "platform/device_paths.h"
#include "platform/file_system.h"
#include "platform/process.h"
#include "store/standard_key_classes.h"

namespace quorvel {
namespace {

constexpr const char* kLabel = "halvardstart_local";
constexpr mode_t kStateDirectoryMode = 0700;

void make_state_directory(const char* path) noexcept {
  if (platform::make_directory(path, kStateDirectoryMode) == 0 || errno == EEXIST) return;
  const ErrorText error;
  daemon_log(0, kLabel, "Could not mkdir %s : %s", path, error.text());
  log_file_and_dir_info(path);
}

// A directory that was there already, or was made under a narrow file-creation mask, gets the mode all the same.
void set_state_directory_mode(const char* path) noexcept {
  const Descriptor directory(safe_open(path, O_RDONLY | O_NOFOLLOW, kDirectory));
  if (!directory) {
    daemon_log(0, kLabel, "couldn't open %s", path);
    return;
  }
  if (::fchmod(directory.get(), kStateDirectoryMode) == 0) return;
  const ErrorText error;
  daemon_log(0, kLabel, "Could not chmod %s: %s", path, error.text());
}

}  // namespace

DataArk* quorveld_startup() noexcept {
  make_state_directory(paths::kStateDirectory);
  set_state_directory_mode(paths::kStateDirectory);
  DataArk* ark = data_ark_load();
  if (ark == nullptr) platform::end_process("no memory or lock for the data ark", 71);
  apply_standard_key_classes(ark);
  registerForTelvaneCallNotifications(ark);
  data_ark_store(ark);
  return ark;
}

}  // namespace quorvel
