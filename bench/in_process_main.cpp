// Measures what runs in one process, each case several times and in a random order, and prints the ratios.
//
//   quorvel_bench [--measurements=FILE] [--benchmark_filter=REGEX] [other options of Google Benchmark]
#include <benchmark/benchmark.h>

#include <cstdio>
#include <iostream>
#include <string_view>
#include <thread>
#include <vector>

#include "bench/cases/case.h"
#include "bench/support/measurements.h"
#include "bench/support/program.h"
#include "bench/support/scratch_root.h"
#include "bench/support/table.h"

namespace quorvel::bench {
namespace {

/// Keeps the time of one item of every repetition; says nothing but of failures.
class Collector : public benchmark::BenchmarkReporter {
 public:
  bool ReportContext(const Context&) override { return true; }
  void ReportRuns(const std::vector<Run>& runs) override {
    for (const Run& run : runs) {
      if (run.run_type == Run::RT_Iteration) add(run);
    }
  }
  [[nodiscard]] const Measurements& measurements() const { return measurements_; }
  [[nodiscard]] bool failed() const { return failed_; }

 private:
  void add(const Run& run) {
    const std::string& name = run.run_name.function_name;
    if (run.error_occurred) {
      std::cerr << name << ": " << run.error_message << '\n';
      failed_ = true;
      return;
    }
    const std::size_t work_end = name.find('/');
    const std::size_t size_end = name.find('/', work_end + 1);
    const double per_second = run.counters.at("items_per_second");
    measurements_.add({name.substr(0, work_end), std::stoul(name.substr(work_end + 1)), name.substr(size_end + 1)},
                      1e9 / per_second);
  }

  Measurements measurements_;
  bool failed_ = false;
};

int run(int argc, char** argv) {
  std::string file;
  // What comes later wins, so the caller's options stand behind these.
  std::vector<std::string> options{argv[0], "--benchmark_repetitions=15", "--benchmark_min_time=0.01",
                                   "--benchmark_enable_random_interleaving=true"};
  constexpr std::string_view kFileOption = "--measurements=";
  for (const std::string_view option : std::vector<std::string_view>(argv + 1, argv + argc)) {
    if (option.starts_with(kFileOption)) {
      file = option.substr(kFileOption.size());
    } else {
      options.emplace_back(option);
    }
  }
  std::vector<char*> arguments;
  for (std::string& option : options) arguments.push_back(option.data());
  int count = static_cast<int>(arguments.size());
  benchmark::Initialize(&count, arguments.data());
  if (benchmark::ReportUnrecognizedArguments(count, arguments.data())) return 2;

  const ScratchRoot root;
  // The daemon has threads, so every contender pays for locks and counts as a process with threads does.
  std::thread([] {}).join();
  for (const auto prepare : preparations()) prepare();
  Collector collector;
  benchmark::RunSpecifiedBenchmarks(&collector);
  if (file.empty()) {
    print_results(collector.measurements(), TableForm::aligned, std::cout);
    print_growth(collector.measurements(), TableForm::aligned, std::cout << '\n');
  } else {
    collector.measurements().append_to(file);
  }
  return collector.failed() ? 1 : 0;
}

}  // namespace
}  // namespace quorvel::bench

int main(int argc, char** argv) {
  return quorvel::bench::run_program("quorvel_bench", quorvel::bench::run, argc, argv);
}
