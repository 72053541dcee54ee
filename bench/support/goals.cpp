#include "bench/support/goals.h"

#include <algorithm>
#include <cmath>

namespace quorvel::bench {
namespace {

constexpr auto kMiddle = Statistic::middle;

constexpr const char* kMsgpack = "msgpack-cxx";
constexpr const char* kNlohmann = "nlohmann";
constexpr const char* kAbsl = "absl::flat_hash_map";
constexpr const char* kGHash = "GHashTable";
constexpr const char* kSpdlog = "spdlog";
constexpr const char* kSdBus = "sd-bus";
constexpr const char* kDbus = "dbus-daemon";
constexpr const char* kRedis = "redis-server";

constexpr Goal kGoals[] = {
    {"encode", 10'000, "encode 10,000 entries", kMsgpack, 0.55},
    {"encode again", 18, "encode 1 KiB into a buffer that is used again", kMsgpack, 2.1},
    {"decode", 10'000, "decode 10,000 entries", kMsgpack, 1.1},
    {"release", 10'000, "release what was decoded", kNlohmann, 0.1},
    {"heap", 10'000, "heap after decoding 10,000 entries", kMsgpack, 1},
    {"set equal", 10'000, "`data_ark_set`, equal value", kAbsl, 0.75},
    {"set changed", 10'000, "`data_ark_set`, changed, uncounted class", kAbsl, 0.75},
    {"set new", 10'000, "`data_ark_set`, new key", kAbsl, 0.75},
    {"copy hit", 10'000, "`data_ark_copy`, hit", kGHash, 0.95},
    {"exists miss", 10'000, "`data_ark_exists`, miss", kGHash, 0.7},
    {"set equal, two threads", 10'000, "`data_ark_set`, equal value, two threads", kAbsl, 0.35, Told::at_most, kMiddle},
    {"set changed, two threads", 10'000, "`data_ark_set`, changed, two threads", kAbsl, 0.35, Told::at_most, kMiddle},
    {"copy hit, two threads", 10'000, "`data_ark_copy`, hit, two threads", kAbsl, 0.6, Told::at_most, kMiddle},
    {"view", 10'000, "domain view of 50 entries among 10,000", kAbsl, 0.6},
    {"save", 10'000, "save 10,000 entries", kMsgpack, 0.65},
    {"load", 10'000, "load 10,000 entries", kMsgpack, 1.05},
    {"log", 1, "one log line, one thread", kSpdlog, 0.7},
    {"log, two threads", 1, "one log line, two threads", kSpdlog, 0.7, Told::at_most, kMiddle},
    {"ipc", 18, "IPC, 1 KiB, one client: time", kSdBus, 0.95, Told::at_most, kMiddle},
    {"ipc, 64 connections", 18, "IPC, 1 KiB, 64 connections: calls a second", kSdBus, 1.9, Told::at_least, kMiddle},
    {"ipc", 1'800, "IPC, 100 KiB, one client: time", kSdBus, 0.35, Told::at_most, kMiddle},
    {"ipc, 64 connections", 1'800, "IPC, 100 KiB, 64 connections: calls a second", kSdBus, 3, Told::at_least, kMiddle},
    {"start", 100, "start to ready, 100 entries", kDbus, 1.2, Told::at_most, kMiddle},
    {"start, processor", 100, "the same, processor time", kDbus, 0.5, Told::at_most, kMiddle},
    {"start", 10'000, "start to ready, 10,000 entries", kRedis, 0.75, Told::at_most, kMiddle},
    {"resident", 100, "resident memory at rest, 100 entries", kDbus, 0.4, Told::at_most, kMiddle},
    {"proportional", 100, "proportional memory at rest, 100 entries", kDbus, 0.4, Told::at_most, kMiddle},
    {"resident", 10'000, "resident memory at rest, 10,000 entries", kRedis, 0.3, Told::at_most, kMiddle},
};

constexpr Growth kGrowths[] = {
    {"encode", "encode"}, {"decode", "decode"}, {"release", "release"}, {"heap", "heap after decoding"},
    {"save", "save"},     {"load", "load"},     {"set equal", "set"},   {"set new", "set, new key"},
    {"copy hit", "copy"},
};

std::optional<double> value_of(const Measurements& measurements, const Goal& goal, std::string_view contender) {
  const std::vector<double>* values = measurements.find({goal.work, goal.entries, std::string(contender)});
  if (values == nullptr) return {};
  return statistic_of(*values, goal.statistic);
}

}  // namespace

std::span<const Goal> goals() { return kGoals; }
std::span<const Growth> growths() { return kGrowths; }

double statistic_of(std::vector<double> values, Statistic statistic) {
  std::sort(values.begin(), values.end());
  return statistic == Statistic::fastest ? values.front() : values[values.size() / 2];
}

std::vector<Result> results(const Measurements& measurements) {
  std::vector<Result> results;
  for (const Goal& goal : kGoals) {
    const std::optional<double> ours = value_of(measurements, goal, kOurs);
    if (!ours) continue;
    Result result{&goal, {}, {}, {}, {}};
    const auto ratio = [&](double theirs) { return goal.told == Told::at_most ? *ours / theirs : theirs / *ours; };
    double best = HUGE_VAL;
    for (const std::string& contender : measurements.contenders(goal.work, goal.entries)) {
      if (contender == kOurs) continue;
      const double value = *value_of(measurements, goal, contender);
      if (contender == kLimit) {
        result.to_limit = ratio(value);
        continue;
      }
      if (contender == goal.rival) result.to_rival = ratio(value);
      if (value >= best) continue;
      best = value;
      result.best_contender = contender;
      result.to_best_contender = ratio(value);
    }
    results.push_back(std::move(result));
  }
  return results;
}

std::vector<GrowthPoint> growth_of(const Measurements& measurements, const char* work, std::string_view contender) {
  const std::string name(contender);
  std::vector<GrowthPoint> points;
  const std::vector<double>* base = measurements.find({work, kGrowthBase, name});
  if (base == nullptr) return points;
  for (const std::size_t entries : measurements.sizes(work, name)) {
    const double value = statistic_of(*measurements.find({work, entries, name}), Statistic::fastest);
    points.push_back({entries, value / statistic_of(*base, Statistic::fastest)});
  }
  return points;
}

bool is_linear(std::span<const GrowthPoint> points) {
  for (std::size_t i = 1; i < points.size(); ++i) {
    const double steps =
        std::log10(static_cast<double>(points[i].entries) / static_cast<double>(points[i - 1].entries));
    if (points[i].to_base / points[i - 1].to_base > std::pow(kLargestStep, steps)) return false;
  }
  return true;
}

}  // namespace quorvel::bench
