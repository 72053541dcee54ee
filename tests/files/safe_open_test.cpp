#include "files/safe_open.h"

#include "platform/descriptor.h"
#include "support/scratch_root.h"

namespace quorvel::test {
namespace {

constexpr int kRewrite = O_WRONLY | O_CREAT | O_TRUNC;
const std::string kHome = "/private/var/mobile";

class SafeOpen : public testing::Test {
 protected:
  SafeOpen() {
    ::umask(022);
    root.write_file(kHome + "/file", "content");
    root.make_link("file", kHome + "/link");
    root.make_link("missing", kHome + "/dangling");
    root.make_link("loop", kHome + "/loop");
    root.make_link(kHome, kHome + "/again");
    root.make_fifo(kHome + "/fifo");
    root.make_directory(kHome + "/directory");
  }

  // A path of `length` bytes whose directories exist.
  std::string long_path(std::size_t length) {
    std::string path = kHome;
    while (path.size() + 202 < length) path += "/" + std::string(200, 'd');
    root.make_directory(path);
    return path + "/" + std::string(length - path.size() - 1, 'f');
  }

  ScratchRoot root;
};

TEST_F(SafeOpen, RefusesWhatIsNotExactlyTheObjectNamed) {
  const auto failed = [](const std::string& path, int error) {
    return "_safe_open: open(" + path + ") failed: " + std::strerror(error);
  };
  const auto fishy = [](const std::string& path, const std::string& actual) {
    return "_safe_open: path " + path + " was actually " + actual + ", something fishy is going on";
  };
  struct Case {
    std::string path;
    int flags;
    mode_t type;
    std::string line;
  };
  const std::string too_long = long_path(1024);
  const std::string too_long_new = long_path(1025);
  root.write_file(too_long, "content");
  const std::vector<Case> cases = {
      {kHome + "/link", O_WRONLY | O_TRUNC, kRegularFile, failed(kHome + "/link", ELOOP)},
      {kHome + "/dangling", kRewrite, kRegularFile, failed(kHome + "/dangling", ELOOP)},
      {kHome + "/loop/file", kRewrite, kRegularFile, failed(kHome + "/loop/file", ELOOP)},
      {kHome + "/missing", O_WRONLY, kRegularFile, failed(kHome + "/missing", ENOENT)},
      {kHome + "/missing/file", kRewrite, kRegularFile, failed(kHome + "/missing/file", ENOENT)},
      {kHome + "/file/new", kRewrite, kRegularFile, failed(kHome + "/file/new", ENOTDIR)},
      {kHome + "/file", O_CREAT | O_EXCL | O_WRONLY, kRegularFile, failed(kHome + "/file", EEXIST)},
      {kHome + "/new/", kRewrite, kRegularFile, failed(kHome + "/new/", EISDIR)},
      {kHome + "/.", kRewrite, kRegularFile, failed(kHome + "/.", EISDIR)},
      {kHome + "/..", kRewrite, kRegularFile, failed(kHome + "/..", EISDIR)},
      {"", kRewrite, kRegularFile, failed("", ENOENT)},
      {"/var/mobile/file", kRewrite, kRegularFile, fishy("/var/mobile/file", kHome + "/file")},
      {"/var/mobile/new", kRewrite, kRegularFile, fishy("/var/mobile/new", kHome + "/new")},
      {"/var/mobile/new", kRewrite | O_EXCL, kRegularFile, fishy("/var/mobile/new", kHome + "/new")},
      {kHome + "/again/file", O_WRONLY | O_TRUNC, kRegularFile, fishy(kHome + "/again/file", kHome + "/file")},
      {kHome + "//file", O_WRONLY | O_TRUNC, kRegularFile, fishy(kHome + "//file", kHome + "/file")},
      {kHome + "/./file", O_WRONLY | O_TRUNC, kRegularFile, fishy(kHome + "/./file", kHome + "/file")},
      {kHome + "/directory/../new", kRewrite, kRegularFile, fishy(kHome + "/directory/../new", kHome + "/new")},
      {kHome + "/directory/", O_RDONLY, kDirectory, fishy(kHome + "/directory/", kHome + "/directory")},
      {"new", kRewrite, kRegularFile, fishy("new", "/new")},
      {kHome + "/directory", O_RDONLY, kRegularFile, "_safe_open: " + kHome + "/directory type is 16384, not 32768"},
      {kHome + "/file", O_WRONLY | O_TRUNC, kDirectory, "_safe_open: " + kHome + "/file type is 32768, not 16384"},
      {kHome + "/fifo", O_RDONLY, kRegularFile, "_safe_open: " + kHome + "/fifo type is 4096, not 32768"},
      {kHome + "/fifo", O_WRONLY, kRegularFile, failed(kHome + "/fifo", ENXIO)},
      {too_long, O_WRONLY | O_TRUNC, kRegularFile,
       "_safe_open: descriptor-path query of " + too_long + " failed: " + std::strerror(ENAMETOOLONG)},
      {too_long_new, kRewrite, kRegularFile, failed(too_long_new, ENAMETOOLONG)},
  };
  log_file_info("/missing");  // opens the log, which stays open
  root.expect_log({"log_file_info: Can't stat /missing: No such file or directory"});
  const std::size_t open_before = descriptors_open();
  for (const Case& c : cases) {
    SCOPED_TRACE(c.path);
    EXPECT_EQ(_safe_open(c.path.c_str(), c.flags, 0644, c.type), -1);
    root.expect_log({c.line});
  }
  EXPECT_EQ(descriptors_open(), open_before);
  EXPECT_EQ(root.read_file(kHome + "/file"), "content");
  EXPECT_EQ(root.read_file(too_long), "content");
  for (const std::string& path : {kHome + "/new", kHome + "/missing", too_long_new}) EXPECT_FALSE(root.exists(path));
}

TEST_F(SafeOpen, OpensCreatesAndTruncatesTheObjectNamed) {
  root.set_mode(kHome + "/file", 0600);
  const std::string longest = long_path(1023);
  struct Case {
    std::string path;
    int flags;
    mode_t type;
    mode_t mode;
  };
  const std::vector<Case> cases = {
      {kHome + "/file", O_RDONLY, kRegularFile, 0600},    {kHome + "/file", kRewrite, kRegularFile, 0600},
      {kHome + "/new", kRewrite, kRegularFile, 0644},     {kHome + "/newer", kRewrite | O_EXCL, kRegularFile, 0644},
      {kHome + "/directory", O_RDONLY, kDirectory, 0755}, {longest, kRewrite, kRegularFile, 0644},
      {"/", O_RDONLY, kDirectory, root.mode_of("/")},     {"/top", kRewrite, kRegularFile, 0644},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.path);
    const Descriptor file(_safe_open(c.path.c_str(), c.flags, 0644, c.type));
    ASSERT_TRUE(file);
    EXPECT_EQ(::fcntl(file.get(), F_GETFL) & O_NONBLOCK, 0);
    EXPECT_EQ(::fcntl(file.get(), F_GETFD), FD_CLOEXEC);
    EXPECT_EQ(root.mode_of(c.path), c.mode);
    EXPECT_TRUE((c.flags & O_TRUNC) == 0 || root.read_file(c.path).empty());
  }
  const Descriptor fifo(_safe_open((kHome + "/fifo").c_str(), O_RDWR | O_NONBLOCK | O_TRUNC, 0, 0x1000));
  EXPECT_EQ(::fcntl(fifo.get(), F_GETFL) & O_NONBLOCK, O_NONBLOCK);
}

TEST_F(SafeOpen, WithoutCreatingRefusesToCreate) {
  const std::string path = kHome + "/new";
  EXPECT_EQ(safe_open(path.c_str(), O_WRONLY | O_CREAT, kRegularFile), -1);
  EXPECT_EQ(errno, EINVAL);
  EXPECT_FALSE(root.exists(path));
  root.expect_log({"safe_open: safe_open can't be used to create " + path});
  EXPECT_TRUE(Descriptor(safe_open((kHome + "/directory").c_str(), O_RDONLY, kDirectory)));
}

TEST_F(SafeOpen, FileInfoTellsOwnerGroupAndMode) {
  const std::string owner = " uid=" + std::to_string(::getuid()) + " gid=" + std::to_string(::getgid());
  root.set_mode(kHome + "/directory", 0700);
  root.set_mode(kHome, 0755);
  errno = EXDEV;
  log_file_and_dir_info((kHome + "/directory").c_str());
  EXPECT_EQ(errno, EXDEV);
  log_file_info((kHome + "/link").c_str());
  log_file_info((kHome + "/dangling").c_str());
  root.expect_log({"log_file_info: stat " + kHome + "/directory" + owner + " p=40700",
                   "log_file_info: stat " + kHome + owner + " p=40755",
                   "log_file_info: stat " + kHome + "/link" + owner + " p=100644",
                   "log_file_info: Can't stat " + kHome + "/dangling: No such file or directory"});
  // The directory's copy of a path is cut to 1024 bytes, here in the middle of the second component.
  const std::string first = "/" + std::string(100, 'a');
  log_file_and_dir_info((first + "/" + std::string(1000, 'b') + "/c").c_str());
  root.expect_log(
      {"log_file_info: Can't stat " + first + "/" + std::string(1000, 'b') + "/c: No such file or directory",
       "log_file_info: Can't stat " + first + ": No such file or directory"});
}

TEST(DirnameInPlace, StripsTheLastComponent) {
  const std::vector<std::pair<std::string, std::string>> cases = {
      {"/a/b", "/a"}, {"a/b/", "a"}, {"a//b", "a"}, {"//a//b", "//a"}, {"/a", "/"},    {"//a", "/"}, {"/", "/"},
      {"///", "/"},   {"a", "."},    {"abc", "."},  {"abc//", "."},    {"/abc/", "/"}, {"", ""},
  };
  for (const auto& [path, directory] : cases) {
    std::string buffer = path;
    buffer.resize(path.size() + 2);
    EXPECT_EQ(dirname_in_place(buffer.data()), buffer.data());
    EXPECT_STREQ(buffer.c_str(), directory.c_str()) << path;
  }
  EXPECT_EQ(dirname_in_place(nullptr), nullptr);
}

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
  for (const bool is_kept : {false, true}) {  // by a backup, as another name of the old content
    const Meddler provisioner([&] {
      root.write_file("/fresh", "");
      ::unlink(root.path("/backup").c_str());
      EXPECT_TRUE(!is_kept || ::link(root.path("/file").c_str(), root.path("/backup").c_str()) == 0);
      std::filesystem::rename(root.path("/fresh"), root.path("/file"));
    });
    for (int i = 0; i < (is_kept ? 50'000 : 20'000); ++i)
      ASSERT_TRUE(Descriptor(_safe_open("/file", O_RDONLY, 0, kRegularFile)));
    EXPECT_GT(provisioner.rounds(), 100);
  }
}

TEST_F(SafeOpen, WaitsAMomentForALease) {
  const std::string path = root.path(kHome + "/file");
  Descriptor holder(::open(path.c_str(), O_RDONLY));
  ::signal(SIGIO, SIG_IGN);
  ASSERT_EQ(::fcntl(holder.get(), F_SETLEASE, F_RDLCK), 0);
  std::thread yielding([&] {
    std::this_thread::sleep_for(120ms);
    ::fcntl(holder.get(), F_SETLEASE, F_UNLCK);
  });
  EXPECT_TRUE(Descriptor(_safe_open((kHome + "/file").c_str(), O_WRONLY, 0, kRegularFile)));
  yielding.join();
}

}  // namespace
}  // namespace quorvel::test
