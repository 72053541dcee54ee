// What was measured, and how it travels from the programs that measure to the one that reports.
#pragma once

#include <cstddef>
#include <map>
#include <string>
#include <string_view>
#include <vector>

namespace quorvel::bench {

inline constexpr std::string_view kOurs = "quorveld";
/// The bare physical operation on the same bytes, where there is one.
inline constexpr std::string_view kLimit = "limit";

/// One quantity: a work, the number of entries it is done with, and who does it.
struct MeasurementKey {
  std::string work;
  std::size_t entries = 0;
  std::string contender;
  auto operator<=>(const MeasurementKey&) const = default;
};

/// Times in nanoseconds for an entry or an operation, or sizes in bytes, one for each repetition.
class Measurements {
 public:
  void add(const MeasurementKey& key, double value) { values_[key].push_back(value); }
  [[nodiscard]] const std::vector<double>* find(const MeasurementKey& key) const;
  /// Everybody who was measured at a work with so many entries.
  [[nodiscard]] std::vector<std::string> contenders(const std::string& work, std::size_t entries) const;
  /// The sizes that a contender was measured at.
  [[nodiscard]] std::vector<std::size_t> sizes(const std::string& work, const std::string& contender) const;

  /// One line for each value: work, entries, contender and value, separated by tabs. Both throw when a file cannot be
  /// read or written.
  void append_to(const std::string& path) const;
  void read(const std::string& path);

 private:
  std::map<MeasurementKey, std::vector<double>> values_;
};

}  // namespace quorvel::bench
