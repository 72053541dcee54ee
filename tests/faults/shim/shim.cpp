// Preloaded into the daemon: stands between it and the C library, counts its calls, and fails one or ends the process
// at one as the plan says.
#include <dlfcn.h>
#include <fcntl.h>
#include <sys/mman.h>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <unistd.h>

#include <algorithm>
#include <atomic>
#include <csignal>
#include <cstdlib>
#include <iterator>
#include <string_view>

#include "faults/shim/plan.h"

namespace quorvel::faults {
namespace {

Plan* plan = nullptr;

// A signal does not interrupt the same call for ever, and the daemon is right to try again.
constexpr std::uint32_t kInterruptions = 20;

[[noreturn]] void end_at_once() {
  ::raise(SIGKILL);
  std::abort();
}

bool can_give(Call call, int error) {
  const auto& errors = kCallErrors[static_cast<std::size_t>(call)].errors;
  return error != 0 && std::find(std::begin(errors), std::end(errors), error) != std::end(errors);
}

std::uint32_t allowed_failures() {
  if (plan->action == Action::fail_once) return 1;
  if (plan->action != Action::fail_from_then_on) return 0;
  return plan->error == EINTR ? kInterruptions : UINT32_MAX;
}

struct Verdict {
  int error = 0;
  bool ends_after = false;
};

// `divisible`: the call moves bytes, and more than one.
Verdict judge(Call call, bool divisible = false) {
  if (plan == nullptr || !plan->armed.load(std::memory_order_acquire)) return {};
  const std::uint32_t number = ++plan->calls;
  if (number < Plan::kTraceSize) plan->trace[number] = call;
  if (plan->action == Action::kill_before && number == plan->target) end_at_once();
  if (plan->action == Action::kill_after) return {0, number == plan->target};
  if (call == plan->kind) ++plan->calls_of_kind;
  if (plan->calls_of_kind < plan->target || !can_give(call, plan->error)) return {};
  if (plan->injected == 0 && call != plan->kind) return {};
  if (plan->error == kShortTransfer && !divisible) return {};
  if (plan->injected >= allowed_failures() || plan->injected++ >= allowed_failures()) return {};
  return {plan->error, false};
}

// The save lasts from the open of its temporary file to the second flush, that of the directory.
void note_begin(Call call, long path) {
  if (plan == nullptr || (call != Call::openat && call != Call::openat2) || plan->save_begun != 0) return;
  if (std::string_view(reinterpret_cast<const char*>(path)).ends_with(".XXXXXX")) plan->save_begun = plan->calls + 1;
}

void note_end(Call call) {
  if (plan != nullptr && call == Call::fdatasync && plan->save_begun != 0) ++plan->save_flushes;
}

// Where temporary files are in memory a flush costs nothing, and no instant would lie inside a save.
void slow_down(Call call) {
  if (plan != nullptr && call == Call::fdatasync && plan->flush_milliseconds != 0) {
    ::usleep(plan->flush_milliseconds * 1000);
  }
}

// A close that fails has closed all the same.
template <class Real>
long pass(Call call, const Real& real) {
  const Verdict verdict = judge(call);
  slow_down(call);
  long result = -1;
  if (verdict.error == 0 || call == Call::close) result = real();
  note_end(call);
  if (verdict.ends_after) end_at_once();
  if (verdict.error == 0) return result;
  errno = verdict.error;
  return -1;
}

// `real` moves so many bytes. Half of the room to receive into would still take in most messages whole.
template <class Real>
long pass_transfer(Call call, std::size_t size, const Real& real) {
  const Verdict verdict = judge(call, size > 1);
  if (verdict.error == kShortTransfer) return real(call == Call::recv ? 7 : size / 2);
  if (verdict.error == 0) {
    const long result = real(size);
    if (verdict.ends_after) end_at_once();
    return result;
  }
  errno = verdict.error;
  return -1;
}

// Arguments are handed on as they came; those that a function does not have are not looked at, and of an int only the
// lower half counts.
using Function = long(long, long, long, long, long, long, long);

Function* next(std::atomic<Function*>& known, const char* name) {
  Function* found = known.load(std::memory_order_relaxed);
  if (found == nullptr) known = found = reinterpret_cast<Function*>(::dlsym(RTLD_NEXT, name));
  return found;
}

}  // namespace
}  // namespace quorvel::faults

using namespace quorvel::faults;

// Defines the library's function `name` under a name of our own, which no header has declared otherwise.
#define STANDS_BEFORE(name)                                                                     \
  extern "C" [[gnu::used]] Function before_##name __asm__(#name);                               \
  static std::atomic<Function*> next_##name;                                                    \
  long before_##name([[maybe_unused]] long a, [[maybe_unused]] long b, [[maybe_unused]] long c, \
                     [[maybe_unused]] long d, [[maybe_unused]] long e, [[maybe_unused]] long f, \
                     [[maybe_unused]] long g)
#define NEXT(name) next(next_##name, #name)

#define PLAIN(name, ...)                                                      \
  STANDS_BEFORE(name) {                                                       \
    note_begin(Call::name, b);                                                \
    return pass(Call::name, [&] { return NEXT(name)(a, b, c, d, e, f, g); }); \
  }
QUORVEL_PLAIN_CALLS(PLAIN)

#define TRANSFER(name)                                                                                             \
  STANDS_BEFORE(name) {                                                                                            \
    return pass_transfer(Call::name, static_cast<std::size_t>(c),                                                  \
                         [&](std::size_t size) { return NEXT(name)(a, b, static_cast<long>(size), d, e, f, g); }); \
  }
TRANSFER(read)
TRANSFER(recv)
TRANSFER(send)

STANDS_BEFORE(write) {
  const auto size = static_cast<std::size_t>(c);
  const long result = pass_transfer(
      Call::write, size, [&](std::size_t part) { return NEXT(write)(a, b, static_cast<long>(part), d, e, f, g); });
  if (static_cast<int>(a) == 2 && result != c && plan != nullptr) plan->error_output_failed = true;
  return result;
}

// The head of the C library's message structure.
struct Message {
  void* name;
  unsigned name_length;
  iovec* parts;
};

STANDS_BEFORE(sendmsg) {
  const iovec& part = reinterpret_cast<const Message*>(b)->parts[0];
  return pass_transfer(Call::sendmsg, part.iov_len, [&](std::size_t size) {
    if (size == part.iov_len) return NEXT(sendmsg)(a, b, c, d, e, f, g);
    return NEXT(send)(a, reinterpret_cast<long>(part.iov_base), static_cast<long>(size), c, 0, 0, 0);
  });
}

STANDS_BEFORE(epoll_ctl) {
  const auto real = [&] { return NEXT(epoll_ctl)(a, b, c, d, e, f, g); };
  constexpr int kAdd = 1;
  constexpr int kModify = 3;
  const auto operation = static_cast<int>(b);
  if (operation != kAdd && operation != kModify) return real();
  return pass(operation == kAdd ? Call::epoll_add : Call::epoll_modify, real);
}

STANDS_BEFORE(syscall) {
  const auto real = [&] { return NEXT(syscall)(a, b, c, d, e, f, g); };
  if (a != SYS_openat2) return real();
  note_begin(Call::openat2, c);
  return pass(Call::openat2, real);
}

STANDS_BEFORE(pthread_create) {
  const long result = pass(Call::pthread_create, [&] { return NEXT(pthread_create)(a, b, c, d, e, f, g); });
  return result == -1 ? errno : result;
}

namespace {

[[gnu::constructor]] void map_plan() {
  const char* path = std::getenv(kPlanVariable);
  if (path == nullptr) return;
  const auto file = static_cast<int>(NEXT(open)(reinterpret_cast<long>(path), O_RDWR, 0, 0, 0, 0, 0));
  void* mapping = ::mmap(nullptr, sizeof(Plan), PROT_READ | PROT_WRITE, MAP_SHARED, file, 0);
  if (mapping == MAP_FAILED) std::abort();
  NEXT(close)(file, 0, 0, 0, 0, 0, 0);
  plan = static_cast<Plan*>(mapping);
}

}  // namespace
