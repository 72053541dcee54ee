// Where libFuzzer, or the replay, comes in.
#include <ctime>

#include "target.h"

namespace {

#if defined(__SANITIZE_ADDRESS__) || defined(__SANITIZE_THREAD__) || defined(__clang__)
constexpr long kMilliseconds = 1000;  // instrumented code runs at about a tenth of the speed
#else
constexpr long kMilliseconds = 100;
#endif

long processor_time() {
  timespec now{};
  ::clock_gettime(CLOCK_THREAD_CPUTIME_ID, &now);
  return now.tv_sec * 1000 + now.tv_nsec / 1'000'000;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size);

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const long start = processor_time();
  quorvel::fuzz::run_once(std::as_bytes(std::span(data, size)));
  quorvel::fuzz::require(processor_time() - start <= kMilliseconds, "this input takes too long");
  return 0;
}
