// A device root in memory, for the process and the daemons it starts.
#pragma once

#include <filesystem>

namespace quorvel::bench {

/// A directory in a memory file system, deleted at the end, with the device root `root` in it, which QUORVEL_ROOT
/// names from then on. One at a time.
class ScratchRoot {
 public:
  ScratchRoot();
  ~ScratchRoot();
  ScratchRoot(const ScratchRoot&) = delete;
  ScratchRoot& operator=(const ScratchRoot&) = delete;

  /// Outside of the device root, for what peers write.
  [[nodiscard]] const std::filesystem::path& outside() const { return directory_; }
  [[nodiscard]] std::filesystem::path root() const { return directory_ / "root"; }
  [[nodiscard]] std::filesystem::path log_file() const {
    return root() / "private/var/mobile/Library/Logs/quorveld.log";
  }
  [[nodiscard]] std::filesystem::path state_directory() const { return root() / "private/var/mobile/Library/qvd"; }
  [[nodiscard]] std::filesystem::path data_file() const { return state_directory() / "data_ark.plist"; }
  [[nodiscard]] std::filesystem::path images_file() const {
    return state_directory() / "regulatory_images/regulatory_images.plist";
  }

 private:
  std::filesystem::path directory_;
};

/// The one that the running program made first.
[[nodiscard]] const ScratchRoot& scratch_root();

}  // namespace quorvel::bench
