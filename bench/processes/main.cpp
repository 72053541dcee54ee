// Measures what takes several processes: calls between them, start-up, and memory at rest. Contenders take turns.
//
//   quorvel_bench_processes [--measurements=FILE]
#include <chrono>
#include <iostream>
#include <string_view>
#include <thread>

#include "bench/processes/child.h"
#include "bench/processes/load.h"
#include "bench/processes/program.h"
#include "bench/processes/service.h"
#include "bench/support/measurements.h"
#include "bench/support/program.h"
#include "bench/support/scratch_root.h"
#include "bench/support/table.h"

namespace quorvel::bench {
namespace {

constexpr int kRounds = 11;
constexpr double kSeconds = 0.1;
constexpr std::size_t kConnections = 64;
/// About 1 KiB and 100 KiB.
constexpr std::size_t kCallSizes[] = {18, 1'800};

void measure_calls(Measurements& measurements) {
  const auto services = make_services();
  for (const std::size_t entries : kCallSizes) {
    const DataSet& data = data_set(entries);
    for (const auto& service : services) service->provide(data);
    for (int round = 0; round < kRounds; ++round) {
      for (const auto& service : services) {
        measurements.add({"ipc", entries, service->name()}, call_one_by_one(*service, data, kSeconds));
        measurements.add({"ipc, 64 connections", entries, service->name()},
                         call_at_once(*service, data, kConnections, kSeconds));
      }
    }
  }
}

void measure_start_and_memory(Measurements& measurements) {
  const auto programs = make_programs();
  for (int round = 0; round < kRounds; ++round) {
    for (const auto& program : programs) {
      program->prepare();
      const Child child(program->command());
      const auto key = [&](const char* work) { return MeasurementKey{work, program->entries(), program->name()}; };
      measurements.add(key("start"), child.time_to_ready());
      measurements.add(key("start, processor"), child.processor_time_to_ready());
      std::this_thread::sleep_for(std::chrono::milliseconds(50));
      const Child::Memory memory = child.memory();
      measurements.add(key("resident"), memory.resident);
      measurements.add(key("proportional"), memory.proportional);
    }
  }
}

int run(int argc, char** argv) {
  constexpr std::string_view kFileOption = "--measurements=";
  const std::string_view option = argc == 2 ? argv[1] : "";
  if (argc > 2 || (argc == 2 && !option.starts_with(kFileOption))) {
    std::cerr << "Usage: quorvel_bench_processes [--measurements=FILE]\n";
    return 2;
  }
  const ScratchRoot root;
  Measurements measurements;
  measure_calls(measurements);
  measure_start_and_memory(measurements);
  if (option.empty()) {
    print_results(measurements, TableForm::aligned, std::cout);
  } else {
    measurements.append_to(std::string(option.substr(kFileOption.size())));
  }
  return 0;
}

}  // namespace
}  // namespace quorvel::bench

int main(int argc, char** argv) {
  return quorvel::bench::run_program("quorvel_bench_processes", quorvel::bench::run, argc, argv);
}
