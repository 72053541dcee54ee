#include "hardening/allocations.h"

#include <malloc.h>

#include <atomic>
#include <cerrno>
#include <cstdlib>
#include <new>

// The allocator beneath: the sanitizers', where there is one, so that they see everything.
#ifdef BENEATH_A_SANITIZER
#define BENEATH(name) __interceptor_##name
#else
#define BENEATH(name) __libc_##name
#endif

extern "C" {
void* BENEATH(malloc)(std::size_t);
void* BENEATH(calloc)(std::size_t, std::size_t);
void* BENEATH(realloc)(void*, std::size_t);
void BENEATH(free)(void*);
}

namespace quorvel::test::allocations {
namespace {

std::atomic<long> live_blocks, live_bytes, peak, numbered, failed, first_failing;
std::atomic<Fault> fault{Fault::none};
std::atomic<bool> counting = false;
// A sanitizer cannot tell a block's size before it has begun itself, which it has when static variables are made.
[[maybe_unused]] const bool counts = counting = true;
thread_local bool spared = false;

bool must_fail() {
  if (fault == Fault::none || spared) return false;
  const long number = numbered++;
  if (number < first_failing || (number > first_failing && fault == Fault::once)) return false;
  ++failed;
  errno = ENOMEM;
  return true;
}

void* count(void* block, int sign) {
  if (block == nullptr || !counting) return block;
  live_blocks += sign;
  const long now = live_bytes += sign * static_cast<long>(::malloc_usable_size(block));
  if (now > peak) peak = now;
  return block;
}

}  // namespace

long blocks() { return live_blocks; }
long bytes() { return live_bytes; }
long peak_bytes() { return peak; }
void forget_peak() { peak = live_bytes.load(); }

void fail(Fault which, long number) {
  numbered = failed = 0;
  first_failing = number;
  fault = which;
}

long stop_failing() {
  fault = Fault::none;
  return failed;
}

void spare_this_thread() { spared = true; }

}  // namespace quorvel::test::allocations

namespace watched = quorvel::test::allocations;

extern "C" {
void* malloc(std::size_t size) { return watched::must_fail() ? nullptr : watched::count(BENEATH(malloc)(size), 1); }
void* calloc(std::size_t number, std::size_t size) {
  return watched::must_fail() ? nullptr : watched::count(BENEATH(calloc)(number, size), 1);
}
void* realloc(void* block, std::size_t size) {
  if (watched::must_fail()) return nullptr;
  watched::count(block, -1);
  void* moved = BENEATH(realloc)(block, size);
  watched::count(moved == nullptr ? block : moved, 1);
  return moved;
}
void free(void* block) { BENEATH(free)(watched::count(block, -1)); }
}

void* operator new(std::size_t size) {
  if (void* block = std::malloc(size)) return block;
  throw std::bad_alloc();
}
void* operator new(std::size_t size, const std::nothrow_t&) noexcept { return std::malloc(size); }
void operator delete(void* block) noexcept { std::free(block); }
void operator delete(void* block, std::size_t) noexcept { std::free(block); }
