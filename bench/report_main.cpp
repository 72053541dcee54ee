// Prints what was measured, and writes the page about it and the data for its picture.
//
//   quorvel_bench_report MEASUREMENTS [TEXTS DOCUMENT DATA]
//
// TEXTS is the folder with the words around the tables; into the folder DATA go the files that bench/chart.gnuplot
// draws.
#include <fstream>
#include <iostream>
#include <iterator>
#include <sstream>
#include <stdexcept>
#include <string>

#include "bench/support/program.h"
#include "bench/support/table.h"

namespace quorvel::bench {
namespace {

std::string read_text(const std::string& path) {
  std::ifstream file(path);
  if (!file) throw std::runtime_error("cannot read " + path);
  return {std::istreambuf_iterator<char>(file), {}};
}

void write_document(const Measurements& measurements, const std::string& texts, std::ostream& out) {
  constexpr std::string_view kMark = "@GROWTH@\n";
  const std::string tail = read_text(texts + "/performance_tail.md");
  const std::size_t mark = tail.find(kMark);
  if (mark == std::string::npos) throw std::runtime_error("no place for the growth in the texts");
  out << read_text(texts + "/performance_head.md");
  print_results(measurements, TableForm::markdown, out);
  out << tail.substr(0, mark);
  print_growth(measurements, TableForm::markdown, out);
  out << tail.substr(mark + kMark.size());
}

// The cost of a call is drawn for rates too: less is better in every bar.
double cost(const Goal& goal, double ratio) { return goal.told == Told::at_most ? ratio : 1 / ratio; }

std::string plain(std::string text) {
  std::erase(text, '`');
  return text;
}

// A row a work: title, ratio, goal, whether it is met.
void write_bars(const Measurements& measurements, std::ostream& out) {
  for (const Result& result : results(measurements)) {
    if (!result.to_rival) continue;
    const Goal& goal = *result.goal;
    out << plain(goal.title) << '\t' << cost(goal, *result.to_rival) << '\t' << cost(goal, goal.bound) << '\t'
        << (result.met() ? "yes" : "no") << '\n';
  }
}

// A block a work: its title, then a row a size.
void write_growth(const Measurements& measurements, std::ostream& out) {
  for (const Growth& growth : growths()) {
    const std::vector<GrowthPoint> points = growth_of(measurements, growth.work, kOurs);
    if (points.size() < 2) continue;
    out << '"' << growth.title << "\"\n";
    for (const GrowthPoint& point : points) {
      out << point.entries << '\t' << point.to_base << '\n';
    }
    out << "\n\n";
  }
}

template <class Write>
void write_to(const std::string& path, Write write) {
  std::ofstream file(path);
  write(file);
  if (!file.flush()) throw std::runtime_error("cannot write " + path);
}

int run(int argc, char** argv) {
  if (argc != 2 && argc != 5) {
    std::cerr << "Usage: quorvel_bench_report MEASUREMENTS [TEXTS DOCUMENT DATA]\n";
    return 2;
  }
  Measurements measurements;
  measurements.read(argv[1]);
  print_results(measurements, TableForm::aligned, std::cout);
  print_growth(measurements, TableForm::aligned, std::cout << '\n');
  if (argc == 2) return 0;
  write_to(argv[3], [&](std::ostream& out) { write_document(measurements, argv[2], out); });
  const std::string data = argv[4];
  write_to(data + "/bars.tsv", [&](std::ostream& out) { write_bars(measurements, out); });
  write_to(data + "/growth.tsv", [&](std::ostream& out) { write_growth(measurements, out); });
  return 0;
}

}  // namespace
}  // namespace quorvel::bench

int main(int argc, char** argv) {
  return quorvel::bench::run_program("quorvel_bench_report", quorvel::bench::run, argc, argv);
}
