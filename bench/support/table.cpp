#include "bench/support/table.h"

#include <algorithm>
#include <iomanip>
#include <ostream>
#include <sstream>

namespace quorvel::bench {
namespace {

using Row = std::vector<std::string>;

std::string number(double value) {
  std::ostringstream text;
  text << std::fixed << std::setprecision(value < 0.1 ? 3 : value < 100 ? 2 : 0) << value;
  return text.str();
}
std::string number(const std::optional<double>& value) { return value ? number(*value) : "–"; }

// Characters, not bytes: what stands in a table is ASCII but for the dash.
std::size_t width_of(const std::string& text) {
  return static_cast<std::size_t>(std::count_if(text.begin(), text.end(), [](char c) { return (c & 0xC0) != 0x80; }));
}

void print(const std::vector<Row>& rows, TableForm form, std::ostream& out) {
  Row rule;
  std::vector<std::size_t> widths;
  for (std::size_t column = 0; column < rows[0].size(); ++column) {
    std::size_t width = 3;
    for (const Row& row : rows) width = std::max(width, width_of(row[column]));
    widths.push_back(width);
  }
  const auto print_row = [&](const Row& row) {
    for (std::size_t column = 0; column < row.size(); ++column) {
      out << (form == TableForm::markdown ? "| " : "") << row[column]
          << std::string(widths[column] - width_of(row[column]), ' ') << (form == TableForm::markdown ? " " : "  ");
    }
    out << (form == TableForm::markdown ? "|\n" : "\n");
  };
  print_row(rows[0]);
  for (const std::size_t width : widths) rule.emplace_back(width, '-');
  print_row(rule);
  std::for_each(rows.begin() + 1, rows.end(), print_row);
}

std::string goal_text(const Goal& goal) {
  return (goal.told == Told::at_most ? "at most " : "at least ") + number(goal.bound);
}

}  // namespace

void print_results(const Measurements& measurements, TableForm form, std::ostream& out) {
  std::vector<Row> rows{
      {"work", "rival", "ratio to limit", "ratio to rival", "ratio to best contender", "goal", "met"}};
  for (const Result& result : results(measurements)) {
    std::string best = number(result.to_best_contender);
    if (result.to_best_contender && result.best_contender != result.goal->rival)
      best += " (" + result.best_contender + ")";
    rows.push_back({result.goal->title, result.goal->rival, number(result.to_limit), number(result.to_rival), best,
                    goal_text(*result.goal),
                    !result.to_rival ? "–"
                    : result.met()   ? "yes"
                                     : "no"});
  }
  print(rows, form, out);
}

void print_growth(const Measurements& measurements, TableForm form, std::ostream& out) {
  constexpr std::size_t kSizes[] = {100, 10'000, 100'000, 1'000'000};
  std::vector<Row> rows{{"cost of an entry with", "100", "10,000", "100,000", "1,000,000", "linear"}};
  for (const Growth& growth : growths()) {
    const std::vector<GrowthPoint> points = growth_of(measurements, growth.work, kOurs);
    if (points.size() < 2) continue;
    Row row{growth.title};
    for (const std::size_t size : kSizes) {
      const auto point = std::find_if(points.begin(), points.end(), [&](const auto& p) { return p.entries == size; });
      row.push_back(point == points.end() ? "–" : number(point->to_base));
    }
    row.push_back(is_linear(points) ? "yes" : "no");
    rows.push_back(std::move(row));
  }
  print(rows, form, out);
}

}  // namespace quorvel::bench
