#include "bench/support/measurements.h"

#include <fstream>
#include <iomanip>
#include <stdexcept>

namespace quorvel::bench {

const std::vector<double>* Measurements::find(const MeasurementKey& key) const {
  const auto found = values_.find(key);
  return found == values_.end() ? nullptr : &found->second;
}

std::vector<std::string> Measurements::contenders(const std::string& work, std::size_t entries) const {
  std::vector<std::string> names;
  for (const auto& [key, values] : values_) {
    if (key.work == work && key.entries == entries) names.push_back(key.contender);
  }
  return names;
}

std::vector<std::size_t> Measurements::sizes(const std::string& work, const std::string& contender) const {
  std::vector<std::size_t> sizes;
  for (const auto& [key, values] : values_) {
    if (key.work == work && key.contender == contender) sizes.push_back(key.entries);
  }
  return sizes;
}

void Measurements::append_to(const std::string& path) const {
  std::ofstream file(path, std::ofstream::app);
  for (const auto& [key, values] : values_) {
    for (const double value : values) {
      file << key.work << '\t' << key.entries << '\t' << key.contender << '\t' << std::setprecision(17) << value
           << '\n';
    }
  }
  if (!file.flush()) throw std::runtime_error("cannot write " + path);
}

void Measurements::read(const std::string& path) {
  std::ifstream file(path);
  if (!file) throw std::runtime_error("cannot read " + path);
  MeasurementKey key;
  double value = 0;
  while (std::getline(file, key.work, '\t') && file >> key.entries && file.ignore() &&
         std::getline(file, key.contender, '\t') && file >> value && file.ignore()) {
    add(key, value);
  }
}

}  // namespace quorvel::bench
