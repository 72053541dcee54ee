#include "bench/support/scratch_root.h"

#include <cstdlib>
#include <stdexcept>
#include <string>

namespace quorvel::bench {
namespace {

const ScratchRoot* the_root = nullptr;

}  // namespace

namespace fs = std::filesystem;

ScratchRoot::ScratchRoot() {
  std::string name =
      (fs::exists("/dev/shm") ? fs::path("/dev/shm") : fs::temp_directory_path()) / "quorvel-bench.XXXXXX";
  if (::mkdtemp(name.data()) == nullptr) throw std::runtime_error("cannot make a scratch directory like " + name);
  directory_ = name;
  fs::create_directories(log_file().parent_path());
  fs::create_directories(images_file().parent_path());
  fs::create_directory_symlink("private/var", root() / "var");
  ::setenv("QUORVEL_ROOT", root().c_str(), 1);
  the_root = this;
}

ScratchRoot::~ScratchRoot() {
  std::error_code ignored;
  fs::remove_all(directory_, ignored);
}

const ScratchRoot& scratch_root() { return *the_root; }

}  // namespace quorvel::bench
