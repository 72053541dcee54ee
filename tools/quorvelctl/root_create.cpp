#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <algorithm>
#include <cerrno>
#include <filesystem>
#include <memory>
#include <utility>

#include "commands.h"
#include "common/human_text.h"
#include "files.h"
#include "output.h"
#include "platform/descriptor.h"
#include "root_samples.h"

namespace quorvel::tools {
namespace {

constexpr const char* kVarTarget = "private/var";

struct RootDirectory {
  const char* path;
  mode_t mode;
};

constexpr RootDirectory kDirectories[] = {
    {"private/var/mobile/Library/qvd", 0700},
    {"private/var/mobile/Library/qvd/regulatory_images", 0755},
    {"private/var/mobile/Library/Logs", 0755},
    {"private/var/mobile/Library/Preferences", 0755},
    {"etc/quorvel", 0755},
    {"run/quorvel", 0755},
};

// The directory `path` below `root`, made with all that leads to it. No link is followed: a root is built of
// directories, and a link could lead out of it.
Descriptor make_path(int root, const std::string& path, mode_t mode) {
  Descriptor directory(::dup(root));
  for (std::size_t start = 0; start < path.size();) {
    const std::size_t end = std::min(path.find('/', start), path.size());
    const std::string name = path.substr(start, end - start);
    const bool last = end == path.size();
    if (::mkdirat(directory.get(), name.c_str(), last ? mode : 0755) != 0 && errno != EEXIST) fail_on("make", path);
    directory = Descriptor(::openat(directory.get(), name.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
    if (!directory) fail_on("open", path);
    start = end + 1;
  }
  return directory;
}

[[noreturn]] void refuse_root(const std::string& path, const std::string& part, const std::string& what) {
  std::string message = path;
  message.append("/").append(part).append(" is ").append(what);
  message.append(", so this is no device root. Choose an empty directory");
  throw Failure{kUnreachable, std::move(message)};
}

// Whether /var of the root is the link that the log's path runs through; nothing stands there yet otherwise.
bool has_var_link(int root, const std::string& path) {
  struct stat status {};
  if (::fstatat(root, "var", &status, AT_SYMLINK_NOFOLLOW) != 0) return false;
  char target[64];
  const ssize_t length = ::readlinkat(root, "var", target, sizeof target);
  const std::string_view found(target, static_cast<std::size_t>(std::max<ssize_t>(length, 0)));
  if (found == kVarTarget || found == "/private/var") return true;
  refuse_root(path, "var", "no link to private/var");
}

// Refuses a directory in which something that is no directory stands where one is needed. Nothing is changed.
void check_path(int root, const std::string& path, const std::string& below) {
  for (std::size_t end = below.find('/');; end = below.find('/', end + 1)) {
    const std::string part = below.substr(0, end);
    struct stat status {};
    if (::fstatat(root, part.c_str(), &status, AT_SYMLINK_NOFOLLOW) != 0) return;
    if (!S_ISDIR(status.st_mode)) {
      refuse_root(path, part, "no directory");
    }
    if (end == std::string::npos) return;
  }
}

// A sample never replaces a file that is there.
void make_sample(int root, const SampleFile& sample) {
  const std::string path = std::string(sample.directory) + '/' + sample.name;
  const Descriptor directory = make_path(root, sample.directory, 0755);
  const Descriptor file(
      ::openat(directory.get(), sample.name, O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0644));
  if (file) return write_all(file.get(), plist_bytes(value_of_word(sample.json, path)), path);
  if (errno != EEXIST) fail_on("create", path);
}

// An empty file that says: this device has a telephony service.
void make_mark(int root) {
  const Descriptor directory = make_path(root, "etc/quorvel", 0755);
  const Descriptor file(
      ::openat(directory.get(), "telephony", O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW | O_CLOEXEC, 0644));
  if (!file && errno != EEXIST) fail_on("create", "etc/quorvel/telephony");
}

Descriptor open_root(const std::string& path) {
  std::error_code error;
  if (std::filesystem::weakly_canonical(path, error) == "/") {
    throw Failure{
        kWrongWords,
        "/ is this machine's own root, which the packages of quorveld set up. Choose a directory of your own, "
        "such as /tmp/device"};
  }
  std::filesystem::create_directories(path, error);
  if (error) throw Failure{kUnreachable, "cannot make " + path + ": " + error.message()};
  Descriptor root(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!root) fail_on("open", path, Place::anywhere);
  return root;
}

int create_root(const std::string& path, bool json) {
  if (path.empty()) throw Failure{kWrongWords, "DIR is empty; name a directory, such as /tmp/device"};
  const Descriptor root = open_root(path);
  const bool has_link = has_var_link(root.get(), path);
  for (const RootDirectory& directory : kDirectories) check_path(root.get(), path, directory.path);
  for (const RootDirectory& directory : kDirectories) {
    static_cast<void>(make_path(root.get(), directory.path, directory.mode));
  }
  if (!has_link && ::symlinkat(kVarTarget, root.get(), "var") != 0) fail_on("make", path + "/var", Place::anywhere);
  for (const SampleFile& sample : kSampleFiles) make_sample(root.get(), sample);
  make_mark(root.get());
  std::error_code error;
  const std::string made = std::filesystem::canonical(path, error).string();
  note("the device root is ready. Next: QUORVEL_ROOT=" + shell_word(made) + " quorveld");
  return print_change({{"root", made}}, {}, {}, json);
}

}  // namespace

void add_root(CLI::App& app, CommandLine& line) {
  CLI::App& root = add_group(app, {"root", "Make a device root, a directory that stands for the device's /",
                                   "  quorvelctl root create /tmp/device"});
  CLI::App& create = add_command(root, {"create", "Make a device root; what is there already stays as it is",
                                        "  quorvelctl root create /tmp/device\n"
                                        "  export QUORVEL_ROOT=/tmp/device\n"
                                        "  telvane-sim & quorveld & quorvelctl log --follow"});
  auto directory = std::make_shared<std::string>();
  add_word(create, "DIR", *directory, "The directory, made when it is missing");
  when_chosen(create, [&line, directory] {
    line.uses_root = false;
    line.run = [&line, directory] { return create_root(*directory, line.json); };
  });
}

}  // namespace quorvel::tools
