#include "platform/run_loop.h"

#include <pthread.h>
#include <sys/signalfd.h>
#include <unistd.h>

#include <cerrno>
#include <csignal>
#include <new>

#include "linux/base/thread.h"
#include "linux/notifications/notification_server.h"
#include "linux/process/run_loop_source.h"

namespace quorvel::platform {

bool RunLoop::open() noexcept {
  if (signals_) return true;
  sigset_t ending;
  sigemptyset(&ending);
  sigaddset(&ending, SIGTERM);
  sigaddset(&ending, SIGINT);
  const int error = ::pthread_sigmask(SIG_BLOCK, &ending, nullptr);
  if (error != 0) {
    errno = error;
    return false;
  }
  Descriptor signals(::signalfd(-1, &ending, SFD_CLOEXEC | SFD_NONBLOCK));
  if (!signals || !queue_.open() || !queue_.add(signals.get(), EPOLLIN, nullptr)) return false;
  signals_ = std::move(signals);
  return true;
}

bool RunLoop::add(RunLoopSource& source, std::uint32_t events) noexcept {
  if (!open() || !queue_.add(source.descriptor, events, &source)) return false;
  source.next = sources_;
  source.has_more = false;
  sources_ = &source;
  return true;
}

void RunLoop::remove(RunLoopSource& source) noexcept {
  queue_.remove(source.descriptor);
  for (RunLoopSource** link = &sources_; *link != nullptr; link = &(*link)->next) {
    if (*link != &source) continue;
    *link = source.next;
    return;
  }
}

// Waits for one event at a time: a served source may end, and no event of it may be met after that. The kernel takes
// ready descriptors in turn, so none waits behind a busy one. False when a signal ends the loop.
bool RunLoop::serve_one_event() noexcept {
  bool unfinished = false;
  for (const RunLoopSource* source = sources_; source != nullptr; source = source->next) unfinished |= source->has_more;
  epoll_event event;
  const int count = queue_.wait({&event, 1}, unfinished ? 0 : -1);
  if (count < 0) return errno == EINTR;
  if (count == 0) return true;
  auto* source = static_cast<RunLoopSource*>(event.data.ptr);
  if (source == nullptr) return false;
  source->serve(source->context);
  return true;
}

void RunLoop::serve_unfinished() noexcept {
  RunLoopSource* next = nullptr;
  for (RunLoopSource* source = sources_; source != nullptr; source = next) {
    next = source->next;
    if (source->has_more) source->serve(source->context);
  }
}

void RunLoop::run() noexcept {
  if (!open()) return;
  while (serve_one_event()) serve_unfinished();
}

RunLoop* main_run_loop() noexcept {
  // Never destroyed: sources are served until the process is gone.
  alignas(RunLoop) static unsigned char storage[sizeof(RunLoop)];
  static auto* const loop = ::new (storage) RunLoop;
  return loop;
}

RunLoop* current_run_loop() noexcept { return ::gettid() == ::getpid() ? main_run_loop() : nullptr; }

// The observers' thread is told to end at once, so that it ends while others do.
void run_main_run_loop() noexcept {
  main_run_loop()->run();
  host::begin_to_end();
  host::notification_server().begin_to_stop();
}

}  // namespace quorvel::platform
