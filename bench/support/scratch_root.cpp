#include "bench/support/scratch_root.h"

namespace quorvel::bench {
namespace {

const ScratchRoot* the_root = nullptr;

const char* in_memory(const char* folder) {
  if (std::filesystem::exists("/dev/shm")) ::setenv("TMPDIR", "/dev/shm", 1);
  return folder;
}

}  // namespace

ScratchRoot::ScratchRoot() : device_(in_memory("root")) {
  device_.ignore_log();
  std::filesystem::create_directories(images_file().parent_path());
  the_root = this;
}

const ScratchRoot& scratch_root() { return *the_root; }

}  // namespace quorvel::bench
