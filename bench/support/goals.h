// The works that are judged: against whom, and what is good enough.
#pragma once

#include <cstddef>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "bench/support/measurements.h"

namespace quorvel::bench {

/// Which of the repetitions counts. The fastest where nothing but noise can be added to the true cost; the middle one
/// where threads or processes meet by chance.
enum class Statistic { fastest, middle };
/// How the ratio is told: ours to theirs, or, for a rate, operations of ours to operations of theirs.
enum class Told { at_most, at_least };

struct Goal {
  const char* work;
  std::size_t entries;
  const char* title;
  const char* rival;  // against whom the goal was set
  double bound;
  Told told = Told::at_most;
  Statistic statistic = Statistic::fastest;
};

[[nodiscard]] std::span<const Goal> goals();

/// A goal with what was measured. Ratios are none when one of the two was not measured.
struct Result {
  const Goal* goal;
  std::string best_contender;
  std::optional<double> to_limit;
  std::optional<double> to_rival;           // that of the goal
  std::optional<double> to_best_contender;  // of all that were measured
  [[nodiscard]] bool met() const {
    return to_rival && (goal->told == Told::at_most ? *to_rival <= goal->bound : *to_rival >= goal->bound);
  }
};

/// Every goal that we were measured at.
[[nodiscard]] std::vector<Result> results(const Measurements& measurements);

[[nodiscard]] double statistic_of(std::vector<double> values, Statistic statistic);

/// The works whose growth is watched.
struct Growth {
  const char* work;
  const char* title;
};
[[nodiscard]] std::span<const Growth> growths();

/// How the cost of one entry changes with their number.
struct GrowthPoint {
  std::size_t entries;
  double to_base;  // the cost of an entry, relative to that with the base number of entries
};
inline constexpr std::size_t kGrowthBase = 10'000;
[[nodiscard]] std::vector<GrowthPoint> growth_of(const Measurements& measurements, const char* work,
                                                 std::string_view contender);

/// Ten times the entries may cost ten times the time, and what larger memory costs; anything that grows with the square
/// would make an entry ten times as dear.
inline constexpr double kLargestStep = 3.2;
[[nodiscard]] bool is_linear(std::span<const GrowthPoint> points);

}  // namespace quorvel::bench
