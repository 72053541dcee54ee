// The telephony service's notification center: follows the service, and tells who observes it.
#pragma once

#include <cstddef>
#include <cstdint>

#include "linux/process/run_loop_source.h"
#include "linux/telephony/telephony_stream.h"
#include "platform/descriptor.h"
#include "platform/telephony.h"

namespace quorvel::platform {

class TelephonyCenter {
 public:
  TelephonyCenter() noexcept = default;
  TelephonyCenter(const TelephonyCenter&) = delete;
  TelephonyCenter& operator=(const TelephonyCenter&) = delete;

  /// False when the center cannot be made.
  [[nodiscard]] bool start() noexcept;
  /// Has everything served by `loop`, and looks for the service for the first time.
  void bind(RunLoop* loop) noexcept;
  [[nodiscard]] bool add_observer(void* context, TelephonyObserver observer, const PropertyValue& name) noexcept;

 private:
  struct Observer {
    PropertyValue name;
    void* context;
    TelephonyObserver call;
    Observer* next;
  };

  static void serve_stream(void* context) noexcept;
  static void try_again(void* context) noexcept;
  [[nodiscard]] bool handle(const wire::Frame& frame) noexcept;
  void deliver(std::string_view name) noexcept;
  static void serve_directory(void* context) noexcept;
  void watch_directory() noexcept;
  void look_for_service() noexcept;
  void watch_stream() noexcept;
  void lose_service() noexcept;
  void say(const char* status) noexcept;
  void schedule_try() noexcept;

  host::TelephonyStream stream_;
  Descriptor timer_;
  Descriptor directory_;      // tells of changes in the service directory
  int directory_watch_ = -1;  // -1 while it is not watched
  RunLoopSource stream_source_;
  RunLoopSource timer_source_;
  RunLoopSource directory_source_;
  RunLoop* loop_ = nullptr;
  const char* status_ = nullptr;  // as the service manager was told last
  int delay_ = 0;                 // milliseconds before the next attempt to connect
  Observer* first_observer_ = nullptr;
  Observer** last_link_ = &first_observer_;
};

}  // namespace quorvel::platform
