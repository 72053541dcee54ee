// A device root in a scratch directory, made for one test and deleted at its end.
#pragma once

#include "support/values.h"
#include "support/watching.h"

namespace quorvel::test {

inline constexpr const char* kLogFile = "/var/mobile/Library/Logs/quorveld.log";
inline constexpr const char* kStateDirectory = "/private/var/mobile/Library/qvd";
inline constexpr const char* kDataFile = "/private/var/mobile/Library/qvd/data_ark.plist";

/// Makes the directories and the /var link that a device has (the state directory is the daemon's to make) and points
/// QUORVEL_ROOT at the root, for this process and the programs it starts. At its end every line in the log must have
/// been read: a line that nobody expected fails the test.
///
/// Paths are absolute, as seen on the device; an absolute symbolic link on the way is not taken. A verb that cannot do
/// what it says throws, which fails the test.
class ScratchRoot {
 public:
  /// `folder`, a relative path, is the root's place within the scratch directory: a long one makes a long root path.
  explicit ScratchRoot(const std::string& folder = "root");
  ~ScratchRoot();
  ScratchRoot(const ScratchRoot&) = delete;
  ScratchRoot& operator=(const ScratchRoot&) = delete;

  /// Where the root lies on this machine; a path of the device on this machine; a directory outside of the root.
  [[nodiscard]] const std::filesystem::path& path() const { return root_; }
  [[nodiscard]] std::filesystem::path path(std::string_view device_path) const;
  [[nodiscard]] const std::filesystem::path& outside() const { return scratch_; }

  /// Missing parent directories are made, an existing file is replaced in place.
  void write_file(std::string_view path, std::string_view content);
  void write_plist(std::string_view path, const PropertyValue& value);
  void make_directory(std::string_view path, mode_t mode = 0755);
  void make_link(std::string_view target, std::string_view path);
  void make_fifo(std::string_view path);
  void set_mode(std::string_view path, mode_t mode);
  /// Removes what stands there, with all that is in it.
  void remove(std::string_view path);

  [[nodiscard]] std::string read_file(std::string_view path) const;
  /// The value in a property-list file; none when the file is missing or holds none.
  [[nodiscard]] PropertyValue read_plist(std::string_view path) const;
  /// True when anything stands there, a dangling link included.
  [[nodiscard]] bool exists(std::string_view path) const;
  /// Permission bits, of a link's own.
  [[nodiscard]] mode_t mode_of(std::string_view path) const;

  /// The lines logged since the last call, each as "function: message"; all of them when the log is a new file. A line
  /// without the proper head comes back whole behind "malformed: ".
  [[nodiscard]] std::vector<std::string> log_lines();
  /// The lines logged since the last call must be these, all of them, in this order.
  void expect_log(std::initializer_list<std::string> lines);
  /// Waits until `line` ("function: message") is among the lines that `log_lines` would give; reads none of them.
  [[nodiscard]] bool wait_for_log(std::string_view line, std::chrono::milliseconds patience = kPatience) const;
  /// For a test that looks at the log file's bytes itself, or is not about the log.
  void ignore_log() { log_ignored_ = true; }

 private:
  [[nodiscard]] std::string whole_log() const;
  [[nodiscard]] std::vector<std::string> lines_behind_read(const std::string& log) const;

  std::filesystem::path scratch_;
  std::filesystem::path root_;
  std::string log_read_;
  bool log_ignored_ = false;
};

}  // namespace quorvel::test
