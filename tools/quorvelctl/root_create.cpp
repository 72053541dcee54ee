#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstring>
#include <filesystem>

#include "commands.h"
#include "common/words.h"
#include "files.h"
#include "output.h"
#include "platform/descriptor.h"
#include "root_samples.h"

namespace quorvel::tools {
namespace {

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

void make_var_link(int root) {
  constexpr const char* kTarget = "private/var";
  if (::symlinkat(kTarget, root, "var") == 0) return;
  char target[64];
  const ssize_t length = errno == EEXIST ? ::readlinkat(root, "var", target, sizeof target) : -1;
  if (length >= 0) {
    const std::string_view found(target, static_cast<std::size_t>(length));
    if (found == kTarget || found == "/private/var") return;
  }
  throw Failure{kUnreachable, "/var of the device root is not the link to private/var; move it out of the way"};
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

int create_root(const std::string& path) {
  std::error_code error;
  std::filesystem::create_directories(path, error);
  const Descriptor root(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!root) fail_on("open", path);
  for (const RootDirectory& directory : kDirectories) {
    static_cast<void>(make_path(root.get(), directory.path, directory.mode));
  }
  make_var_link(root.get());
  for (const SampleFile& sample : kSampleFiles) make_sample(root.get(), sample);
  note("the device root is ready. Next: QUORVEL_ROOT=$(realpath " + path + ") quorveld");
  return kDone;
}

}  // namespace

void add_root(CLI::App& app, CommandLine& line) {
  CLI::App* root = add_command(app, {"root", "Make a device root, a directory that stands for the device's /",
                                     "  quorvelctl root create /tmp/device"});
  root->require_subcommand(1);
  CLI::App* create = add_command(*root, {"create", "Make a device root; what is there already stays as it is",
                                         "  quorvelctl root create /tmp/device\n"
                                         "  export QUORVEL_ROOT=/tmp/device\n"
                                         "  telvane-sim & quorveld & quorvelctl regulatory-images"});
  auto directory = std::make_shared<std::string>();
  add_word(*create, "DIR", *directory, "The directory, made when it is missing")->required();
  create->callback([&line, directory] {
    line.uses_root = false;
    line.run = [directory] { return create_root(*directory); };
  });
}

}  // namespace quorvel::tools
