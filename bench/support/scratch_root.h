// A device root in memory, for the process and the daemons it starts.
#pragma once

#include <filesystem>

#include "support/scratch_root.h"

namespace quorvel::bench {

/// The tests' scratch root, made in a memory file system where there is one. QUORVEL_ROOT names it from then on. One at
/// a time.
class ScratchRoot {
 public:
  ScratchRoot();

  /// Outside of the device root, for what contenders write.
  [[nodiscard]] const std::filesystem::path& outside() const { return device_.outside(); }
  [[nodiscard]] const std::filesystem::path& root() const { return device_.path(); }
  [[nodiscard]] std::filesystem::path log_file() const {
    return root() / "private/var/mobile/Library/Logs/quorveld.log";
  }
  [[nodiscard]] std::filesystem::path data_file() const { return device_.path(test::kDataFile); }
  [[nodiscard]] std::filesystem::path images_file() const {
    return device_.path(test::kStateDirectory) / "regulatory_images/regulatory_images.plist";
  }

 private:
  test::ScratchRoot device_;
};

/// The one that the running program made first.
[[nodiscard]] const ScratchRoot& scratch_root();

}  // namespace quorvel::bench
