// Reports of the log writer's own failures. They cannot go to the log, so they go to standard error.
#pragma once

#include <cstddef>

namespace quorvel {

/// The failure that writing one line met. It is written to standard error when this object ends, which is after the log
/// lock has been given back.
class TroubleReport {
 public:
  TroubleReport() noexcept = default;  // leaves the text alone: hardly a line needs it
  TroubleReport(const TroubleReport&) = delete;
  TroubleReport& operator=(const TroubleReport&) = delete;
  ~TroubleReport();

  /// Tells of a failed call on the log file, as "_safe_open: WHAT(PATH) failed: ERROR" with the text of errno, at most
  /// once a minute; reports between are counted and the next one tells how many. With the log lock held.
  void call_failed(const char* what, const char* path) noexcept;

  /// The same for a log file of the wrong type.
  void wrong_type(const char* path, unsigned found, unsigned expected) noexcept;

 private:
  void finish(int length) noexcept;

  char text_[512];
  std::size_t length_ = 0;
};

}  // namespace quorvel
