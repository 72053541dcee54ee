// Where the data ark lies on disk, as seen from the device root.
#pragma once

#include "platform/file_system.h"

namespace quorvel {

/// The data file, the temporary file of a save, and where a file that could not be used is set aside.
struct DataArkPaths {
  DataArkPaths() noexcept;
  char directory[platform::kPathSize];
  char file[platform::kPathSize];
  char temporary[platform::kPathSize];
  char set_aside[platform::kPathSize];
};

}  // namespace quorvel
