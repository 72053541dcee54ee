#include "powercut/recorded_disk.h"

#include <linux/fs.h>
#include <linux/loop.h>
#include <sched.h>
#include <sys/ioctl.h>
#include <sys/mman.h>
#include <sys/mount.h>
#include <sys/prctl.h>
#include <sys/wait.h>

#include "support/watching.h"

#define FUSE_USE_VERSION 31
#include <fuse3/fuse.h>

namespace quorvel::test {
namespace {

constexpr std::size_t kJournalSize = std::size_t{1} << 30;
constexpr const char* kDiskName = "/disk";

// At the journal's start. The server alone adds to it.
struct JournalHead {
  std::atomic<std::size_t> used;
  std::atomic<std::uint32_t> stage;
};
constexpr std::size_t kFirstRecord = 64;

struct RecordHead {
  std::uint64_t offset;
  std::uint32_t length;
  std::uint32_t stage;
};

std::runtime_error failure(const std::string& what) { return std::runtime_error(what + ": " + std::strerror(errno)); }

JournalHead& head_of(std::span<std::byte> journal) { return *reinterpret_cast<JournalHead*>(journal.data()); }

// The server's side.
struct Drive {
  std::span<std::byte> content;
  std::span<std::byte> journal;
};

Drive& drive() { return *static_cast<Drive*>(fuse_get_context()->private_data); }

// False when the journal is full.
bool record(const Drive& drive, std::uint64_t offset, std::span<const std::byte> bytes) {
  JournalHead& head = head_of(drive.journal);
  const std::size_t at = head.used;
  const std::size_t end = (at + sizeof(RecordHead) + bytes.size() + 15) & ~std::size_t{15};
  if (end > drive.journal.size()) return false;
  const RecordHead record = {offset, static_cast<std::uint32_t>(bytes.size()), head.stage};
  std::memcpy(&drive.journal[at], &record, sizeof record);
  if (!bytes.empty()) std::memcpy(&drive.journal[at + sizeof record], bytes.data(), bytes.size());
  head.used = end;
  return true;
}

bool is_disk(const char* path) { return std::strcmp(path, kDiskName) == 0; }

int get_attributes(const char* path, struct stat* status, fuse_file_info*) {
  *status = {};
  const bool root = std::strcmp(path, "/") == 0;
  if (!root && !is_disk(path)) return -ENOENT;
  status->st_mode = root ? S_IFDIR | 0755 : S_IFREG | 0600;
  status->st_nlink = root ? 2 : 1;
  status->st_size = root ? 0 : static_cast<off_t>(drive().content.size());
  return 0;
}

// Nothing may be cached between the loop device and the journal.
int open_disk(const char* path, fuse_file_info* info) {
  info->direct_io = 1;
  return is_disk(path) ? 0 : -ENOENT;
}

int read_disk(const char*, char* out, std::size_t size, off_t offset, fuse_file_info*) {
  const std::span<std::byte> content = drive().content;
  const auto from = std::min(static_cast<std::size_t>(offset), content.size());
  size = std::min(size, content.size() - from);
  std::memcpy(out, content.data() + from, size);
  return static_cast<int>(size);
}

int write_disk(const char*, const char* bytes, std::size_t size, off_t offset, fuse_file_info*) {
  const auto at = static_cast<std::size_t>(offset);
  if (at > drive().content.size() || size > drive().content.size() - at) return -ENOSPC;
  if (!record(drive(), at, std::as_bytes(std::span(bytes, size)))) return -EIO;
  std::memcpy(&drive().content[at], bytes, size);
  return static_cast<int>(size);
}

int flush_disk(const char*, int, fuse_file_info*) { return record(drive(), 0, {}) ? 0 : -EIO; }

[[noreturn]] void serve(Drive drive, const std::string& directory) {
  ::prctl(PR_SET_PDEATHSIG, SIGKILL);
  fuse_operations operations{};
  operations.getattr = get_attributes;
  operations.open = open_disk;
  operations.read = read_disk;
  operations.write = write_disk;
  operations.fsync = flush_disk;
  std::string arguments[] = {"recorded_disk", "-f", "-s", directory};
  char* list[] = {arguments[0].data(), arguments[1].data(), arguments[2].data(), arguments[3].data()};
  ::_exit(fuse_main(4, list, &operations, &drive));
}

}  // namespace

SharedPages::SharedPages(std::size_t size) {
  void* pages = ::mmap(nullptr, size, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS | MAP_NORESERVE, -1, 0);
  if (pages == MAP_FAILED) throw failure("no memory for a disk");
  bytes_ = {static_cast<std::byte*>(pages), size};
}

SharedPages::~SharedPages() { ::munmap(bytes_.data(), bytes_.size()); }

std::string RecordedDisk::obstacle() {
  if (::geteuid() != 0) return "mounting takes root";
  for (const char* device : {"/dev/fuse", "/dev/loop-control"})
    if (::access(device, R_OK | W_OK) != 0) return std::string("no ") + device;
  if (::unshare(CLONE_NEWNS) != 0 || ::mount("none", "/", nullptr, MS_REC | MS_PRIVATE, nullptr) != 0)
    return "no mount namespace to be had";
  return "";
}

RecordedDisk::RecordedDisk(std::size_t size, const std::filesystem::path& directory)
    : content_(size), journal_(kJournalSize), directory_(directory) {
  forget_records();
  server_ = ::fork();
  if (server_ == 0) serve({content_.bytes(), journal_.bytes()}, directory.string());
  const std::filesystem::path file = directory / (kDiskName + 1);
  if (!eventually([&] { return std::filesystem::exists(file); })) throw failure("no disk");
  attach_loop(file);
}

RecordedDisk::~RecordedDisk() {
  loop_ = Descriptor();
  ::umount2(directory_.c_str(), MNT_DETACH);
  ::kill(server_, SIGKILL);
  ::waitpid(server_, nullptr, 0);
}

// The device is given back when its last descriptor is closed, however this process ends.
void RecordedDisk::attach_loop(const std::filesystem::path& file) {
  const Descriptor disk(::open(file.c_str(), O_RDWR | O_CLOEXEC));
  const Descriptor control(::open("/dev/loop-control", O_RDWR | O_CLOEXEC));
  loop_config config{};
  config.fd = static_cast<__u32>(disk.get());
  config.info.lo_flags = LO_FLAGS_AUTOCLEAR;
  for (int tries = 0; tries < 20; ++tries) {  // somebody else may take the device that was free
    const int number = ::ioctl(control.get(), LOOP_CTL_GET_FREE);
    device_ = "/dev/loop" + std::to_string(number);
    loop_ = Descriptor(::open(device_.c_str(), O_RDWR | O_CLOEXEC));
    if (loop_ && ::ioctl(loop_.get(), LOOP_CONFIGURE, &config) == 0) return;
  }
  throw failure("no loop device");
}

void RecordedDisk::forget_cache() const {
  if (::ioctl(loop_.get(), BLKFLSBUF) != 0) throw failure("the device's cache stays");
}

void RecordedDisk::set_stage(std::uint32_t stage) const { head_of(journal_.bytes()).stage = stage; }

std::size_t RecordedDisk::position() const { return head_of(journal_.bytes()).used; }

void RecordedDisk::forget_records(std::size_t from) const {
  head_of(journal_.bytes()).used = std::max(from, kFirstRecord);
}

std::vector<RecordedDisk::Record> RecordedDisk::records(std::size_t from) const {
  const std::span<const std::byte> journal = journal_.bytes();
  std::vector<Record> records;
  for (std::size_t at = std::max(from, kFirstRecord); at < position();) {
    RecordHead head;
    std::memcpy(&head, &journal[at], sizeof head);
    records.push_back({head.offset, head.stage, journal.subspan(at + sizeof head, head.length)});
    at = (at + sizeof head + head.length + 15) & ~std::size_t{15};
  }
  return records;
}

}  // namespace quorvel::test
