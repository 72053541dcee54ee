// How a case is named and measured. Each contender's file registers what it takes part in before main() runs, so that a
// contender that is not built in is simply not there.
#pragma once

#include <benchmark/benchmark.h>

#include <cstddef>
#include <ctime>
#include <map>
#include <mutex>
#include <string>
#include <string_view>
#include <vector>

namespace quorvel::bench {

inline constexpr std::size_t kSize = 10'000;
/// The other sizes at which growth is looked at, and those of the store alone.
inline constexpr std::size_t kGrowthSizes[] = {100, kSize, 100'000};
inline constexpr std::size_t kStoreGrowthSizes[] = {100, kSize, 100'000, 1'000'000};

/// "work/entries/contender": what the reporter takes apart again.
[[nodiscard]] inline std::string case_name(std::string_view work, std::size_t entries, std::string_view contender) {
  return std::string(work) + '/' + std::to_string(entries) + '/' + std::string(contender);
}

/// Adds a case, measured in processor time, which what else runs on the machine disturbs least: nothing here waits. A
/// case of several threads is given the clock on the wall. The sizes that only show growth are repeated less often.
template <class Run>
benchmark::internal::Benchmark* add_case(std::string_view work, std::size_t entries, std::string_view contender,
                                         Run* run) {
  auto* added = benchmark::RegisterBenchmark(case_name(work, entries, contender).c_str(),
                                             [run, entries](benchmark::State& state) { run(state, entries); });
  return entries == kSize ? added : added->Repetitions(5);
}

/// Takes the processor time of `work` alone as the time of this iteration.
template <class Work>
void time_iteration(benchmark::State& state, Work&& work) {
  const auto now = [] {
    timespec time{};
    ::clock_gettime(CLOCK_THREAD_CPUTIME_ID, &time);
    return static_cast<double>(time.tv_sec) + static_cast<double>(time.tv_nsec) * 1e-9;
  };
  const double start = now();
  work();
  state.SetIterationTime(now() - start);
}

/// Ends a case with the number of things it did, or as failed: one wrong result and there is no measurement.
inline void finish(benchmark::State& state, std::size_t done_in_iteration, bool all_right) {
  state.SetItemsProcessed(state.iterations() * static_cast<std::int64_t>(done_in_iteration));
  if (!all_right) state.SkipWithError("wrong result");
}

/// What a case needs for so many entries, made once, by whichever of its threads comes first.
template <class Material>
[[nodiscard]] Material& material(std::size_t entries) {
  static std::map<std::size_t, Material> made;
  static std::mutex mutex;
  const std::lock_guard hold(mutex);
  return made.try_emplace(entries, entries).first->second;
}

/// What is made before the first case runs, so that nobody's memory lies in the gaps that other cases left behind.
[[nodiscard]] inline std::vector<void (*)()>& preparations() {
  static std::vector<void (*)()> all;
  return all;
}

}  // namespace quorvel::bench
