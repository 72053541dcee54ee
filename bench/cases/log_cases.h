// One log line, for every contender alike. A contender is a class with
//
//   write(number, thread)  writes one line that ends with "THREAD line NUMBER"
//   files()                where the lines are, oldest first
#pragma once

#include <filesystem>
#include <fstream>
#include <vector>

#include "bench/cases/case.h"

namespace quorvel::bench {

/// The number of the last line of a thread, when each that is still there is whole and follows the one before; 0 when
/// none is there or the lines are wrong. A run starts again with number 1; other lines may lie between.
[[nodiscard]] inline unsigned last_line(const std::vector<std::filesystem::path>& files, unsigned thread) {
  const std::string mark = std::to_string(thread) + " line ";
  unsigned last = 0;
  for (const std::filesystem::path& path : files) {
    std::ifstream file(path);
    for (std::string line; std::getline(file, line);) {
      const std::size_t at = line.rfind(" line ");
      if (at == std::string::npos || at == 0) continue;
      const std::size_t start = line.rfind(' ', at - 1) + 1;
      if (line.compare(start, mark.size(), mark) != 0) continue;
      const auto number = static_cast<unsigned>(std::stoul(line.substr(start + mark.size())));
      if (last != 0 && number != last + 1 && number != 1) return 0;
      last = number;
    }
  }
  return last;
}

template <class Log>
void log_case(benchmark::State& state) {
  static Log log;
  const auto thread = static_cast<unsigned>(state.thread_index());
  unsigned number = 0;
  for ([[maybe_unused]] auto iteration : state) log.write(++number, thread);
  // A thread that is done early can find its lines rotated away by the other one's, but not by its own.
  const unsigned last = last_line(log.files(), thread);
  finish(state, 1, last == number || (state.threads() > 1 && last == 0));
}

template <class Log>
bool register_log(std::string_view contender) {
  benchmark::RegisterBenchmark(case_name("log", 1, contender).c_str(), log_case<Log>);
  benchmark::RegisterBenchmark(case_name("log, two threads", 1, contender).c_str(), log_case<Log>)
      ->Threads(2)
      ->UseRealTime();
  return true;
}

}  // namespace quorvel::bench
