#include "core/run_daemon.h"

#include "core/quorvel_daemon.h"
#include "core/quorveld_startup.h"
#include "log/daemon_log.h"
#include "log/extended_logging.h"
#include "platform/ipc.h"
#include "platform/process.h"
#include "platform/run_loop.h"
#include "platform/telephony.h"
#include "protocol/quorvel_protocol.h"

namespace quorvel {
namespace {

// Lives as long as the process: connections hand it out to requests on other threads.
constinit QuorvelDaemon the_daemon;

// Opens the listener, serves until the run loop ends, and closes it again. Returns the exit status.
int serve() noexcept {
  platform::IpcListener* listener = platform::create_listener(protocol::kServiceName);
  if (listener == nullptr) platform::end_process("no memory for the listener", 71);
  platform::set_delegate(listener, {&the_daemon, QuorvelDaemon::accept});
  const int status = platform::resume(listener);
  if (status == 0) {
    platform::report_ready();
    platform::run_main_run_loop();
  }
  platform::release_listener(listener);
  return status;
}

}  // namespace

int run_daemon() noexcept {
  if (const int status = platform::start_process(protocol::kServiceName); status != 0) return status;
  daemon_log(0, "main", "____________________ Quorvel startup _____________________");
  if (platform::TelephonyCenter* center = platform::default_telephony_center(); center != nullptr) {
    platform::bind_to_run_loop(center, platform::current_run_loop(), platform::RunLoopMode::default_mode);
  }
  setup_extended_logging();
  the_daemon.set_dark(quorveld_startup());
  return serve();
}

}  // namespace quorvel
