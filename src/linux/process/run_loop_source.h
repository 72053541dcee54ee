// What the run loop serves: descriptors that somebody wants to hear of. Main thread only.
#pragma once

#include <cstdint>

#include "linux/base/event_queue.h"
#include "platform/descriptor.h"
#include "platform/run_loop.h"

namespace quorvel::platform {

/// One descriptor and what to do when it is ready. Belongs to whoever registers it, and stays where it is meanwhile.
struct RunLoopSource {
  int descriptor = -1;
  void (*serve)(void* context) noexcept = nullptr;
  void* context = nullptr;
  /// Set by `serve` when it has work left that the descriptor will not announce: it is called again after a look at the
  /// other descriptors.
  bool has_more = false;
  RunLoopSource* next = nullptr;
};

class RunLoop {
 public:
  /// Blocks the signals that end the loop and makes its descriptors; to be called before any thread exists. True at
  /// once when that is done already; false with errno set.
  [[nodiscard]] bool open() noexcept;
  /// Serves `source` from now on, until it is removed. `serve` may remove its own source. False with errno set.
  [[nodiscard]] bool add(RunLoopSource& source, std::uint32_t events) noexcept;
  void remove(RunLoopSource& source) noexcept;
  void run() noexcept;

 private:
  [[nodiscard]] bool serve_one_event() noexcept;
  void serve_unfinished() noexcept;

  host::EventQueue queue_;
  Descriptor signals_;
  RunLoopSource* sources_ = nullptr;
};

}  // namespace quorvel::platform
