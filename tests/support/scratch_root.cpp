#include "support/scratch_root.h"

#include <fstream>

#include "property/binary/binary.h"

namespace quorvel::test {
namespace {

namespace fs = std::filesystem;

void check(int result, const fs::path& path) {
  if (result != 0) throw std::system_error(errno, std::generic_category(), path.string());
}

fs::path make_scratch_directory() {
  std::string name = (fs::temp_directory_path() / "quorvel-XXXXXX").string();
  if (::mkdtemp(name.data()) == nullptr) check(-1, name);
  return name;
}

// "stamp pid=1 (0x2) function: message" without its head.
std::string without_head(const std::string& line) {
  int pid = 0;
  int head = 0;
  std::sscanf(line.c_str(), "%*3s %*3s %*2d %*2d:%*2d:%*2d %*d pid=%d (0x%*x) %n", &pid, &head);
  return head > 0 && pid > 0 ? line.substr(static_cast<std::size_t>(head)) : "malformed: " + line;
}

std::string content_of(const fs::path& path) {
  std::ostringstream content;
  content << std::ifstream(path, std::ifstream::binary).rdbuf();
  return std::move(content).str();
}

std::vector<std::string> lines_of(const std::string& log) {
  std::istringstream text(log);
  std::vector<std::string> lines;
  for (std::string line; std::getline(text, line);) lines.push_back(without_head(line));
  return lines;
}

}  // namespace

ScratchRoot::ScratchRoot(const std::string& folder) : scratch_(make_scratch_directory()), root_(scratch_ / folder) {
  make_directory("/private/var/mobile/Library/Logs");
  make_directory("/private/var/mobile/Library/Preferences");
  make_directory("/etc/quorvel");
  make_directory("/run/quorvel");
  make_link("private/var", "/var");
  ::setenv("QUORVEL_ROOT", root_.c_str(), 1);
}

ScratchRoot::~ScratchRoot() {
  if (!log_ignored_)
    for (const std::string& line : lines_behind_read(whole_log()))
      ADD_FAILURE() << "a line in the log that nobody expected: " << line;
  std::error_code error;
  fs::remove_all(scratch_, error);
}

fs::path ScratchRoot::path(std::string_view device_path) const { return root_ / fs::path(device_path).relative_path(); }

void ScratchRoot::write_file(std::string_view path, std::string_view content) {
  const fs::path at = this->path(path);
  fs::create_directories(at.parent_path());
  std::ofstream file(at, std::ofstream::binary);
  file.write(content.data(), static_cast<std::streamsize>(content.size()));
  file.close();
  check(file ? 0 : -1, at);
}

void ScratchRoot::write_plist(std::string_view path, const PropertyValue& value) { write_file(path, encoded(value)); }

void ScratchRoot::make_directory(std::string_view path, mode_t mode) {
  fs::create_directories(this->path(path));
  set_mode(path, mode);
}

void ScratchRoot::make_link(std::string_view target, std::string_view path) {
  fs::create_symlink(target, this->path(path));
}

void ScratchRoot::make_fifo(std::string_view path) { check(::mkfifo(this->path(path).c_str(), 0644), path); }

void ScratchRoot::set_mode(std::string_view path, mode_t mode) { check(::chmod(this->path(path).c_str(), mode), path); }

void ScratchRoot::remove(std::string_view path) { fs::remove_all(this->path(path)); }

std::string ScratchRoot::read_file(std::string_view path) const {
  const fs::path at = this->path(path);
  if (!fs::is_regular_file(at)) throw std::runtime_error("no regular file: " + at.string());
  return content_of(at);
}

PropertyValue ScratchRoot::read_plist(std::string_view path) const {
  const std::string content = content_of(this->path(path));
  return read_binary(std::as_bytes(std::span(content)), Mutability::immutable);
}

bool ScratchRoot::exists(std::string_view path) const { return fs::exists(fs::symlink_status(this->path(path))); }

mode_t ScratchRoot::mode_of(std::string_view path) const {
  struct stat status {};
  check(::lstat(this->path(path).c_str(), &status), path);
  return status.st_mode & 07777;
}

std::string ScratchRoot::whole_log() const {
  const fs::path log = path(kLogFile);
  return fs::is_regular_file(log) ? content_of(log) : "";
}

std::vector<std::string> ScratchRoot::lines_behind_read(const std::string& log) const {
  return lines_of(log.starts_with(log_read_) ? log.substr(log_read_.size()) : log);
}

std::vector<std::string> ScratchRoot::log_lines() {
  std::string log = whole_log();
  std::vector<std::string> lines = lines_behind_read(log);
  log_read_ = std::move(log);
  return lines;
}

void ScratchRoot::expect_log(std::initializer_list<std::string> lines) {
  EXPECT_EQ(log_lines(), std::vector<std::string>(lines));
}

bool ScratchRoot::wait_for_log(std::string_view line, std::chrono::milliseconds patience) const {
  return eventually(
      [&] {
        const auto lines = lines_behind_read(whole_log());
        return std::find(lines.begin(), lines.end(), line) != lines.end();
      },
      patience);
}

}  // namespace quorvel::test
