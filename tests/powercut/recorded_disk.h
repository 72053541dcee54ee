// A disk that remembers every write and every flush, so that a power cut at any instant of its past can be tried.
#pragma once

#include "platform/descriptor.h"
#include "support/prelude.h"

namespace quorvel::test {

/// Memory that a process and its children share; zero, and taken only where it is written to.
class SharedPages {
 public:
  explicit SharedPages(std::size_t size);
  ~SharedPages();
  SharedPages(const SharedPages&) = delete;
  SharedPages& operator=(const SharedPages&) = delete;
  [[nodiscard]] std::span<std::byte> bytes() const { return bytes_; }

 private:
  std::span<std::byte> bytes_;
};

/// A block device whose content lies in memory. A process of its own serves it, through FUSE and a loop device, so that
/// whoever waits for the disk can always be ended. Needs root.
class RecordedDisk {
 public:
  /// A write, or without bytes a flush, and the stage that was set when it came.
  struct Record {
    std::uint64_t offset = 0;
    std::uint32_t stage = 0;
    std::span<const std::byte> bytes;
  };

  /// What is missing on this machine to have such a disk; empty when nothing is. Takes the process into a mount
  /// namespace of its own, so that whatever it mounts ends with it.
  [[nodiscard]] static std::string obstacle();

  /// `directory` is an empty one.
  RecordedDisk(std::size_t size, const std::filesystem::path& directory);
  ~RecordedDisk();
  RecordedDisk(const RecordedDisk&) = delete;
  RecordedDisk& operator=(const RecordedDisk&) = delete;

  [[nodiscard]] const std::string& device() const { return device_; }
  /// To be written to only while nobody uses the device.
  [[nodiscard]] std::span<std::byte> content() const { return content_.bytes(); }
  /// Makes the kernel forget what it holds of the device's content.
  void forget_cache() const;

  void set_stage(std::uint32_t stage) const;
  /// Everything since the last `forget_records`. The bytes last until then.
  [[nodiscard]] std::vector<Record> records(std::size_t from = 0) const;
  /// The end of what is recorded so far, for `records` and `forget_records`.
  [[nodiscard]] std::size_t position() const;
  void forget_records(std::size_t from = 0) const;

 private:
  void attach_loop(const std::filesystem::path& file);

  SharedPages content_;
  SharedPages journal_;
  std::filesystem::path directory_;
  pid_t server_ = -1;
  Descriptor loop_;
  std::string device_;
};

}  // namespace quorvel::test
