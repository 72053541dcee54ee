// The power fails at an instant of a save: what a file system makes of what the disk has kept must hold the old file or
// the new one, and the new one once the save has returned.
//
// A disk keeps what was written before its last flush. Of what was written since, a cut keeps all, none, some writes,
// all but one, or some blocks of some writes. The control runs the same saves with flushes that do nothing, and has to
// find torn and lost files: only then does the experiment see what it is for.
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/syscall.h>
#include <sys/wait.h>

#include <fstream>
#include <random>

#include "powercut/recorded_disk.h"
#include "store/data_ark.h"
#include "support/figures.h"
#include "support/program.h"
#include "support/scratch_root.h"

// Takes the place of the C library's in this process.
static bool flushes_reach_the_disk = true;
extern "C" int fdatasync(int descriptor) {
  return flushes_reach_the_disk ? static_cast<int>(::syscall(SYS_fdatasync, descriptor)) : 0;
}

namespace quorvel::test {
namespace {

namespace fs = std::filesystem;
using Record = RecordedDisk::Record;

struct FileSystem {
  const char* name;
  const char* type;
  std::size_t mebibytes;
  const char* make;
  const char* options;
  bool quick;
};

// ext4 flushes by itself when a file is renamed over another, which would hide a flush that is missing.
constexpr FileSystem kFileSystems[] = {
    {"ext4", "ext4", 64, "mkfs.ext4 -q -F -E nodiscard,lazy_itable_init=0 -J size=8", "noauto_da_alloc", true},
    {"ext4Writeback", "ext4", 64, "mkfs.ext4 -q -F -E nodiscard,lazy_itable_init=0 -J size=8",
     "noauto_da_alloc,data=writeback", false},
    {"xfs", "xfs", 320, "mkfs.xfs -q -f -K", "", true},
    {"btrfs", "btrfs", 160, "mkfs.btrfs -q -f -K -d single -m single", "", true}};

void PrintTo(const FileSystem& system, std::ostream* out) { *out << system.name; }

std::optional<std::string> content_of(const fs::path& path) {
  std::ifstream file(path, std::ifstream::binary);
  if (!file) return std::nullopt;
  return std::string{std::istreambuf_iterator<char>(file), {}};
}

void write_to(const fs::path& path, const std::string& content) {
  if (!(std::ofstream(path, std::ofstream::binary) << content << std::flush)) throw std::runtime_error(path.string());
}

// A flush that is none of the program's under test.
void flush(const fs::path& path) {
  const Descriptor object(::open(path.c_str(), O_RDONLY | O_CLOEXEC));
  if (::syscall(SYS_fsync, object.get()) != 0) throw std::runtime_error("no flush of " + path.string());
}

struct Found {
  std::optional<std::string> file;
  std::optional<std::string> set_aside;
  bool operator==(const Found&) const = default;
};

Found found_at(const fs::path& path) { return {content_of(path), content_of(path.string() + ".unreadable")}; }

// Somebody else who writes to the disk and flushes it all the time: without it hardly anything reaches a disk in an
// order of its own.
class Noise {
 public:
  explicit Noise(const fs::path& path)
      : thread_([this, path] {
          std::ofstream file(path, std::ofstream::binary | std::ofstream::app);
          while (!stopping_) {
            file << std::string(700, 'n') << std::flush;
            flush(path);
            std::this_thread::sleep_for(7ms);
          }
        }) {}
  ~Noise() {
    stopping_ = true;
    thread_.join();
  }

 private:
  std::atomic<bool> stopping_ = false;
  std::thread thread_;
};

// What is saved, and how. `prepare` is for what comes before a save.
struct Saver {
  const char* name;
  const char* file;
  std::function<void(int number)> prepare;
  std::function<void()> save;
};

constexpr std::size_t kSizes[] = {20, 5000, 70'000, 300'000, 900};

class PowerCut : public testing::TestWithParam<FileSystem> {
 protected:
  void SetUp() override {
    if (const std::string obstacle = RecordedDisk::obstacle(); !obstacle.empty()) GTEST_SKIP() << obstacle;
    if (!GetParam().quick && !is_long_run()) GTEST_SKIP() << "left to the long run";
    if (const auto known = content_of("/proc/filesystems"); known->find(GetParam().type) == std::string::npos)
      GTEST_SKIP() << "this kernel does not know " << GetParam().type;
    root.ignore_log();
    fs::create_directories(root.outside() / "fuse");
    fs::create_directories(root.outside() / "kept");
    const std::size_t size = GetParam().mebibytes << 20;
    disk.emplace(size, root.outside() / "fuse");
    kept.emplace(size);
    const std::string make = GetParam().make + (" " + disk->device()) + " >&2";
    if (std::system(make.c_str()) != 0) GTEST_SKIP() << "cannot make a file system: " << GetParam().make;
    ASSERT_TRUE(mounted());
    for (const char* folder : {"/private/var/mobile/Library/Logs", "/private/var/mobile/Library/Preferences",
                               "/private/var/mobile/Library/qvd", "/etc/quorvel", "/run/quorvel"})
      root.make_directory(folder, 0700);
    root.make_link("private/var", "/var");
    unmount();
    for (const Record& record : disk->records()) apply(record, kept->bytes());
    disk->forget_records();
  }

  // A save's stages: twice its number while it runs, and one more once it has returned. Nothing is asked of stage 0.
  void record(const Saver& saver, int saves) {
    file = saver.file;
    before.clear();
    after.clear();
    disk->forget_records();
    ASSERT_TRUE(mounted());
    const pid_t child = ::fork();
    if (child == 0) save_and_end(saver, saves);
    int status = -1;
    ::waitpid(child, &status, 0);
    ASSERT_EQ(status, 0);
    unmount();
    for (int i = 1; i <= saves; ++i) {
      before.push_back(found_at(kept_path(i, "before")));
      after.push_back(found_at(kept_path(i, "after")));
    }
    records = disk->records();
  }

  struct Counts {
    int cuts = 0;
    int inside = 0;
    int reordered = 0;
    int bad = 0;
  };

  // Cuts the power so many times, at instants from the first to the last.
  Counts cut(int cuts) {
    std::vector<std::size_t> instants[2];
    for (std::size_t i = 0; i < records.size(); ++i) {
      const std::uint32_t stage = records[i].stage;
      // Somebody else's flush soon brings the rest of a save that has returned to the disk.
      const bool late = i >= 3 && stage % 2 == 1 && records[i - 3].stage == stage;
      if (stage != 0 && !late) instants[stage % 2].push_back(i);
    }
    // Without flushes a save may return before anything is written.
    for (const int one : {0, 1})
      if (instants[one].empty()) instants[one] = instants[1 - one];
    std::vector<std::size_t> chosen;
    for (int i = 0; i < cuts; ++i) {
      const std::vector<std::size_t>& from = instants[i % 5 < 3 ? 0 : 1];
      chosen.push_back(from.at(random() % std::max<std::size_t>(from.size(), 1)));
    }
    std::sort(chosen.begin(), chosen.end());
    // The disk as it was when the recording began.
    for (const Record& record : records) restore(record);
    Counts counts;
    std::size_t applied = 0;
    for (const std::size_t instant : chosen) {
      std::size_t flushed = instant;
      while (flushed > applied && !records[flushed].bytes.empty()) --flushed;
      for (; applied < flushed; ++applied)
        for (const auto disk_content : {kept->bytes(), disk->content()}) apply(records[applied], disk_content);
      const std::span<const Record> pending(&records[applied], instant + 1 - applied);
      cut_with(pending, records[instant].stage, counts);
      for (const Record& record : pending) restore(record);
    }
    return counts;
  }

  static void tell(const std::string& what, const Counts& counts) {
    tell_figure("power cuts, " + std::string(GetParam().name) + ", " + what, "0 bad",
                std::to_string(counts.cuts) + " cuts, " + std::to_string(counts.inside) + " inside the save, " +
                    std::to_string(counts.reordered) + " reordered, " + std::to_string(counts.bad) + " bad",
                counts.bad == 0);
    EXPECT_GE(counts.inside, counts.cuts / 3);
    EXPECT_GE(counts.reordered, counts.cuts / 5);
  }

  ScratchRoot root;

 private:
  bool mounted() const {
    disk->forget_cache();
    return ::mount(disk->device().c_str(), root.path().c_str(), GetParam().type, MS_NOATIME, GetParam().options) == 0;
  }
  void unmount() const {
    if (::umount(root.path().c_str()) != 0) throw std::runtime_error("the disk stays mounted");
  }
  [[nodiscard]] fs::path kept_path(int number, const char* when) const {
    return root.outside() / "kept" / (std::to_string(number) + when);
  }

  [[noreturn]] void save_and_end(const Saver& saver, int saves) {
    ::prctl(PR_SET_PDEATHSIG, SIGKILL);
    const auto keep = [&](int number, const char* when) {
      const Found found = found_at(root.path(file));
      if (found.file) write_to(kept_path(number, when), *found.file);
      if (found.set_aside) write_to(kept_path(number, when).string() + ".unreadable", *found.set_aside);
    };
    {
      const Noise noise(root.path("/noise"));
      for (int number = 1; number <= saves; ++number) {
        saver.prepare(number);
        keep(number, "before");
        disk->set_stage(static_cast<std::uint32_t>(2 * number));
        saver.save();
        disk->set_stage(static_cast<std::uint32_t>(2 * number + 1));
        keep(number, "after");
        ::usleep(static_cast<useconds_t>(random() % 25'000));
        disk->set_stage(0);
      }
    }
    ::_exit(testing::Test::HasFailure() ? 1 : 0);
  }

  static void apply(const Record& record, std::span<std::byte> content) {
    if (!record.bytes.empty()) std::memcpy(&content[record.offset], record.bytes.data(), record.bytes.size());
  }
  void restore(const Record& record) const {
    if (!record.bytes.empty())
      std::memcpy(&disk->content()[record.offset], &kept->bytes()[record.offset], record.bytes.size());
  }

  void cut_with(std::span<const Record> pending, std::uint32_t stage, Counts& counts) {
    enum { all, all_but_one, some, some_blocks, none, kinds };
    const auto kind = random() % kinds;
    const std::size_t left_out = random() % pending.size();
    constexpr std::size_t kBlock = 4096;
    for (std::size_t i = 0; i < pending.size(); ++i) {
      const Record& record = pending[i];
      if (kind == all || (kind == all_but_one && i != left_out) || (kind == some && random() % 2 == 0))
        apply(record, disk->content());
      for (std::size_t at = 0; kind == some_blocks && at < record.bytes.size(); at += kBlock)
        if (random() % 2 == 0)
          apply({record.offset + at, 0, record.bytes.subspan(at, std::min(kBlock, record.bytes.size() - at))},
                disk->content());
    }
    ++counts.cuts;
    counts.inside += stage % 2 == 0;
    counts.reordered += kind != all && kind != none;
    const std::size_t position = disk->position();
    std::string fault = "cannot be mounted";
    if (mounted()) {
      fault = fault_of(found_at(root.path(file)), stage);
      unmount();
    }
    for (const Record& record : disk->records(position)) restore(record);
    disk->forget_records(position);
    if (fault.empty()) return;
    if (++counts.bad <= 3)
      std::printf("cut of kind %d, %zu writes pending, save %u, %s: %s\n", static_cast<int>(kind), pending.size(),
                  stage / 2, stage % 2 == 0 ? "running" : "returned", fault.c_str());
  }

  [[nodiscard]] std::string fault_of(const Found& found, std::uint32_t stage) const {
    const Found& old = before[stage / 2 - 1];
    const Found& updated = after[stage / 2 - 1];
    if (found == updated) return "";
    // A file that could not be loaded is set aside before the new one takes its place.
    const bool between = !found.file && found.set_aside && found.set_aside == old.file;
    if (stage % 2 == 0 && (found == old || between)) return "";
    return !found.file ? "missing" : found == old ? "stale" : std::to_string(found.file->size()) + " bytes";
  }

  std::optional<RecordedDisk> disk;
  std::optional<SharedPages> kept;  // what has surely reached the disk
  std::string file;
  std::vector<Found> before;
  std::vector<Found> after;
  std::vector<Record> records;

 protected:
  std::mt19937 random{20'260'131};

  // Saves that replace the data file, remove it, and set aside one that could not be loaded.
  Saver store_saver() {
    const auto domain = text("com.example");
    const auto key = text("Payload");
    const auto ark = std::make_shared<DataArk*>(nullptr);
    const auto prepare = [=, this](int number) {
      if (number % 5 == 3) {
        write_to(root.path(kDataFile), "not a property list " + std::to_string(number));
        flush(root.path(kDataFile));
        flush(root.path(kStateDirectory));
      }
      if (*ark == nullptr || number % 5 == 3) *ark = data_ark_load();
      if (number % 2 == 0) {
        data_ark_remove(*ark, domain, key);
        return;
      }
      std::string payload(kSizes[random() % std::size(kSizes)] + random() % 200, 'p');
      for (char& byte : payload) byte = static_cast<char>(random() % 256);
      EXPECT_EQ(data_ark_set(*ark, domain, key, test::data(payload)), 0);
    };
    return {"data ark", kDataFile, prepare, [=] { data_ark_store(*ark); }};
  }

  Saver command_saver(const char* name, const char* saved, std::vector<std::string> arguments, bool through_input) {
    const auto json = std::make_shared<std::string>();
    const auto prepare = [=, this](int number) {
      *json = "{\"Number\": " + std::to_string(number) + ", \"Text\": \"" +
              std::string(kSizes[random() % 3] + random() % 200, 'p') + "\"}";
    };
    const auto save = [=, this] {
      std::vector<std::string> words = arguments;
      if (through_input)
        words.push_back(root.path(saved).string());
      else
        words.push_back(*json);
      EXPECT_EQ(run_to_end(control_program(), words, through_input ? *json : "").status, 0);
    };
    return {name, saved, prepare, save};
  }
};

TEST_P(PowerCut, LeavesTheOldDataArkOrTheNewOne) {
  const Saver saver = store_saver();
  record(saver, static_cast<int>(quick_or_long(30, 100)));
  tell(saver.name, cut(static_cast<int>(quick_or_long(48, 1000))));
}

TEST_P(PowerCut, LeavesWhatTheCommandsWroteOnceTheyReturned) {
  const Saver savers[] = {
      command_saver("plist write", "/private/var/mobile/Library/qvd/written.plist", {"plist", "write"}, true),
      command_saver("preferences set", "/private/var/mobile/Library/Preferences/com.example.plist",
                    {"preferences", "set", "com.example", "Key"}, false)};
  for (const Saver& saver : savers) {
    record(saver, static_cast<int>(quick_or_long(8, 40)));
    tell(saver.name, cut(static_cast<int>(quick_or_long(10, 100))));
  }
}

TEST_P(PowerCut, BreaksFilesWhenNothingIsFlushed) {
  flushes_reach_the_disk = false;
  const Saver saver = store_saver();
  record(saver, static_cast<int>(quick_or_long(20, 60)));
  const Counts counts = cut(static_cast<int>(quick_or_long(20, 200)));
  tell_figure("power cuts, " + std::string(GetParam().name) + ", control without flushes", "at least a tenth bad",
              std::to_string(counts.bad) + " bad of " + std::to_string(counts.cuts), counts.bad * 10 >= counts.cuts);
}

INSTANTIATE_TEST_SUITE_P(power_cut, PowerCut, testing::ValuesIn(kFileSystems), testing::PrintToStringParamName());

}  // namespace
}  // namespace quorvel::test
