// Prints what was measured, and writes the page and the picture of it.
//
//   quorvel_bench_report MEASUREMENTS [TEXTS DOCUMENT PICTURE]
//
// TEXTS is the folder with the words around the tables.
#include <fstream>
#include <iostream>
#include <iterator>
#include <sstream>
#include <stdexcept>
#include <string>

#include "bench/support/chart.h"
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

template <class Write>
void write_to(const std::string& path, Write write) {
  std::ofstream file(path);
  write(file);
  if (!file.flush()) throw std::runtime_error("cannot write " + path);
}

int run(int argc, char** argv) {
  if (argc != 2 && argc != 5) {
    std::cerr << "Usage: quorvel_bench_report MEASUREMENTS [TEXTS DOCUMENT PICTURE]\n";
    return 2;
  }
  Measurements measurements;
  measurements.read(argv[1]);
  print_results(measurements, TableForm::aligned, std::cout);
  print_growth(measurements, TableForm::aligned, std::cout << '\n');
  if (argc == 2) return 0;
  write_to(argv[3], [&](std::ostream& out) { write_document(measurements, argv[2], out); });
  write_to(argv[4], [&](std::ostream& out) { draw(measurements, out); });
  return 0;
}

}  // namespace
}  // namespace quorvel::bench

int main(int argc, char** argv) {
  try {
    return quorvel::bench::run(argc, argv);
  } catch (const std::exception& error) {
    std::cerr << "quorvel_bench_report: " << error.what() << '\n';
    return 1;
  }
}
