#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include <cerrno>
#include <cstdlib>
#include <filesystem>
#include <memory>

#include "commands.h"
#include "files.h"
#include "output.h"
#include "platform/descriptor.h"

namespace quorvel::tools {
namespace {

constexpr const char* kStandardStream = "-";

int show_file(const std::string& path, bool json) {
  if (path == kStandardStream)
    return print_value(parse_plist(read_all(STDIN_FILENO, "standard input", Place::anywhere), path), json);
  const Descriptor file(::open(path.c_str(), O_RDONLY | O_CLOEXEC | O_NOCTTY));
  if (!file) fail_on("open", path, Place::anywhere);
  return print_value(parse_plist(read_all(file.get(), path, Place::anywhere), path), json);
}

// Has the new name survive a power cut as the file does.
void flush_directory_of(const std::string& path) {
  const std::filesystem::path parent = std::filesystem::path(path).parent_path();
  const std::string directory = parent.empty() ? "." : parent.string();
  const Descriptor descriptor(::open(directory.c_str(), O_RDONLY | O_DIRECTORY | O_CLOEXEC));
  if (!descriptor || ::fsync(descriptor.get()) != 0) fail_on("flush", directory, Place::anywhere);
}

// A file that is there or is to be made is replaced as a whole; anything else, such as a pipe, is written into.
void write_file(const std::string& given, const std::string& bytes) {
  std::error_code error;
  const std::filesystem::path resolved = std::filesystem::canonical(given, error);
  const std::string path = error ? given : resolved.string();
  struct stat status {};
  const bool exists = ::stat(path.c_str(), &status) == 0;
  if (exists && !S_ISREG(status.st_mode)) {
    const Descriptor file(::open(path.c_str(), O_WRONLY | O_CLOEXEC | O_NOCTTY));
    if (!file) fail_on("open", path, Place::anywhere);
    return write_all(file.get(), bytes, path, Place::anywhere);
  }
  std::string temporary = path + ".XXXXXX";
  const Descriptor file(::mkostemp(temporary.data(), O_CLOEXEC));
  if (!file) fail_on("create", path, Place::anywhere);
  try {
    const mode_t mask = ::umask(0);
    ::umask(mask);
    const mode_t mode = exists ? status.st_mode & 07777 : 0666 & ~mask;
    write_all(file.get(), bytes, path, Place::anywhere);
    if (exists && ::fchown(file.get(), status.st_uid, status.st_gid) != 0) note("the owner of " + path + " changes");
    if (::fchmod(file.get(), mode) != 0 || ::fsync(file.get()) != 0) fail_on("write", path, Place::anywhere);
    if (::rename(temporary.c_str(), path.c_str()) != 0) fail_on("replace", path, Place::anywhere);
  } catch (const Failure&) {
    ::unlink(temporary.c_str());
    throw;
  }
  flush_directory_of(path);
}

int write_plist(const std::string& path, bool json) {
  const PropertyValue value =
      value_of_word(read_all(STDIN_FILENO, "standard input", Place::anywhere), "standard input");
  if (!value) throw Failure{kWrongWords, "standard input: null is no value that a property list can hold"};
  const std::string bytes = plist_bytes(value);
  if (path == kStandardStream) {
    write_output(bytes);
    return kDone;
  }
  write_file(path, bytes);
  return print_change({{"file", path}}, "bytes", PropertyValue::unsigned_integer(bytes.size()), json);
}

}  // namespace

void add_plist(CLI::App& app, CommandLine& line) {
  CLI::App& plist =
      add_group(app, {"plist", "Show and write property-list files",
                      "  quorvelctl plist show images.plist\n"
                      "  echo '{\"Label\": {\"$data\": \"AAEC\"}}' | quorvelctl plist write images.plist\n"
                      "  quorvelctl plist show a.plist --json | quorvelctl plist write b.plist\n\n"
                      "FILE is an ordinary path; the device root does not count here."});
  auto file = std::make_shared<std::string>();
  CLI::App& show =
      add_command(plist, {"show", "Print a property-list file", "  quorvelctl plist show --json images.plist"});
  add_word(show, "FILE", *file, "The file; - is standard input");
  when_chosen(show, [&line, file] {
    line.uses_root = false;
    line.run = [&line, file] { return show_file(*file, line.json); };
  });

  CLI::App& write =
      add_command(plist, {"write", "Write a property-list file from the JSON on standard input",
                          R"(  echo '[1, true, {"$date": "2026-01-31T12:00:00Z"}]' | quorvelctl plist write -)"});
  add_word(write, "FILE", *file, "The file, replaced as a whole; - is standard output");
  when_chosen(write, [&line, file] {
    line.uses_root = false;
    line.run = [&line, file] { return write_plist(*file, line.json); };
  });
}

}  // namespace quorvel::tools
