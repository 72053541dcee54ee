#include <fcntl.h>
#include <gtest/gtest.h>
#include <sys/stat.h>
#include <unistd.h>

#include <atomic>
#include <cstdio>
#include <filesystem>
#include <functional>
#include <string>
#include <thread>

#include "files/safe_open.h"
#include "platform/descriptor.h"
#include "support/descriptors.h"
#include "support/scratch_root.h"

namespace quorvel::test {
namespace {

// Does something over and over on a thread of its own until it ends.
class Meddler {
 public:
  explicit Meddler(std::function<void()> act)
      : thread_([this, act = std::move(act)] {
          for (; !stop_; ++rounds_) act();
        }) {}
  ~Meddler() {
    stop_ = true;
    thread_.join();
  }
  Meddler(const Meddler&) = delete;
  Meddler& operator=(const Meddler&) = delete;
  [[nodiscard]] long rounds() const { return rounds_; }

 private:
  std::atomic<bool> stop_ = false;
  std::atomic<long> rounds_ = 0;
  std::thread thread_;
};

TEST(SafeOpenRace, NothingOutsideTheCanonicalPathIsOpenedOrMade) {
  ScratchRoot root;
  root.ignore_log();
  root.write_file("/state/file", "");
  root.write_file("/decoy/file", "precious");
  root.make_link("/decoy", "/spare");
  const Descriptor state(::open(root.path("/state").c_str(), O_PATH | O_DIRECTORY));
  struct stat real {};
  ASSERT_EQ(::fstatat(state.get(), "file", &real, 0), 0);
  const std::string first = root.path("/state");
  const std::string second = root.path("/spare");
  const Meddler meddler([&] { ::renameat2(AT_FDCWD, first.c_str(), AT_FDCWD, second.c_str(), RENAME_EXCHANGE); });
  int accepted = 0;
  int refused = 0;
  int made = 0;
  for (int i = 0; i < 20'000; ++i) {
    const Descriptor file(_safe_open("/state/file", O_WRONLY | O_CREAT | O_TRUNC, 0644, kRegularFile));
    struct stat opened = real;
    if (file) ::fstat(file.get(), &opened);
    EXPECT_EQ(opened.st_ino, real.st_ino);
    ++(file ? accepted : refused);
    made += static_cast<bool>(Descriptor(_safe_open("/state/new", O_WRONLY | O_CREAT, 0644, kRegularFile)));
    ::unlinkat(state.get(), "new", 0);
  }
  for (const long count : {long{accepted}, long{refused}, long{made}, meddler.rounds()}) EXPECT_GT(count, 100);
  EXPECT_EQ(root.read_file("/decoy/file"), "precious");
  EXPECT_FALSE(root.exists("/decoy/new"));
}

TEST(SafeOpenRace, AFileReplacedByARenameIsNeverRefused) {
  ScratchRoot root;
  root.write_file("/file", "");
  const Meddler provisioner([&] {
    root.write_file("/fresh", "");
    std::filesystem::rename(root.path("/fresh"), root.path("/file"));
  });
  for (int i = 0; i < 20'000; ++i) ASSERT_TRUE(Descriptor(_safe_open("/file", O_RDONLY, 0, kRegularFile)));
  EXPECT_GT(provisioner.rounds(), 100);
}

}  // namespace
}  // namespace quorvel::test
