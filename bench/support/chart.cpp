#include "bench/support/chart.h"

#include <algorithm>
#include <cmath>
#include <iomanip>
#include <ostream>
#include <sstream>
#include <string_view>

namespace quorvel::bench {
namespace {

// Works are listed on the left, their bars lie beside them; the curves stand below.
constexpr double kWidth = 960;
constexpr double kLabels = 330;
constexpr double kMargin = 30;
constexpr double kRow = 22;
constexpr double kTop = 70;
constexpr double kCurves = 330;

constexpr const char* kColours[] = {"#1b6ca8", "#c0392b", "#2e8b57", "#8e44ad", "#d68910",
                                    "#16a085", "#7f8c8d", "#34495e", "#ad1457"};

/// A logarithmic scale from a range of values onto a range of the picture.
struct Scale {
  double low, high, from, to;
  [[nodiscard]] double operator()(double value) const {
    const double share = std::log(std::clamp(value, low, high) / low) / std::log(high / low);
    return from + share * (to - from);
  }
};

std::string escaped(std::string_view text) {
  std::string out;
  for (const char c : text) {
    if (c == '`') continue;
    out += c == '&' ? "&amp;" : c == '<' ? "&lt;" : c == '>' ? "&gt;" : std::string(1, c);
  }
  return out;
}

class Svg {
 public:
  Svg(std::ostream& out, double height) : out_(out) {
    out_ << std::fixed << std::setprecision(1) << "<svg xmlns=\"http://www.w3.org/2000/svg\" viewBox=\"0 0 " << kWidth
         << ' ' << height << "\" font-family=\"sans-serif\" font-size=\"12\">\n"
         << "<rect width=\"100%\" height=\"100%\" fill=\"#ffffff\"/>\n";
  }
  ~Svg() { out_ << "</svg>\n"; }
  Svg(const Svg&) = delete;
  Svg& operator=(const Svg&) = delete;

  void text(double x, double y, std::string_view text, const char* anchor = "start", const char* colour = "#222222") {
    out_ << "<text x=\"" << x << "\" y=\"" << y << "\" text-anchor=\"" << anchor << "\" fill=\"" << colour << "\">"
         << escaped(text) << "</text>\n";
  }
  void line(double x1, double y1, double x2, double y2, const char* colour, double width = 1) {
    out_ << "<line x1=\"" << x1 << "\" y1=\"" << y1 << "\" x2=\"" << x2 << "\" y2=\"" << y2 << "\" stroke=\"" << colour
         << "\" stroke-width=\"" << width << "\"/>\n";
  }
  void bar(double x1, double x2, double y, const char* colour) {
    out_ << "<rect x=\"" << std::min(x1, x2) << "\" y=\"" << y << "\" width=\"" << std::abs(x2 - x1) << "\" height=\""
         << kRow - 8 << "\" fill=\"" << colour << "\"/>\n";
  }
  void curve(const std::vector<std::pair<double, double>>& points, const char* colour) {
    out_ << "<polyline fill=\"none\" stroke-width=\"2\" stroke=\"" << colour << "\" points=\"";
    for (const auto& [x, y] : points) out_ << x << ',' << y << ' ';
    out_ << "\"/>\n";
    for (const auto& [x, y] : points) {
      out_ << "<circle cx=\"" << x << "\" cy=\"" << y << "\" r=\"3\" fill=\"" << colour << "\"/>\n";
    }
  }

 private:
  std::ostream& out_;
};

std::string short_number(double value) {
  std::ostringstream text;
  text << std::setprecision(2) << value;
  return text.str();
}

// The cost of a call is drawn for rates too: less is better in every bar.
double cost(const Goal& goal, double ratio) { return goal.told == Told::at_most ? ratio : 1 / ratio; }

void draw_bars(Svg& svg, const std::vector<Result>& results) {
  const Scale scale{0.05, 5, kLabels, kWidth - kMargin};
  const double bottom = kTop + kRow * static_cast<double>(results.size());
  svg.text(kMargin, 28, "Cost relative to the peer that each goal names (left of the line: cheaper; tick: the goal)");
  for (const double value : {0.05, 0.1, 0.2, 0.5, 1.0, 2.0, 5.0}) {
    svg.line(scale(value), kTop - 8, scale(value), bottom, value == 1 ? "#222222" : "#dddddd");
    svg.text(scale(value), kTop - 14, short_number(value), "middle");
  }
  double y = kTop;
  for (const Result& result : results) {
    svg.text(kLabels - 10, y + 11, result.goal->title, "end");
    if (result.to_peer) {
      svg.bar(scale(1), scale(cost(*result.goal, *result.to_peer)), y, result.met() ? "#2e8b57" : "#c0392b");
      const double goal = scale(cost(*result.goal, result.goal->bound));
      svg.line(goal, y - 3, goal, y + kRow - 5, "#222222", 3);
    }
    y += kRow;
  }
}

void draw_growth(Svg& svg, const Measurements& measurements, double top) {
  const Scale x{100, 1'000'000, kLabels, kWidth - kMargin};
  const Scale y{0.1, 30, top + kCurves - 30, top + 30};
  svg.text(kMargin, top, "Cost of one entry as their number grows, relative to that with 10,000 (level: linear)");
  for (const double value : {0.1, 0.3, 1.0, 3.0, 10.0, 30.0}) {
    svg.line(kLabels, y(value), kWidth - kMargin, y(value), "#dddddd");
    svg.text(kLabels - 8, y(value) + 4, short_number(value), "end");
  }
  constexpr std::pair<double, const char*> kSizes[] = {
      {100, "100"}, {1'000, "1,000"}, {10'000, "10,000"}, {100'000, "100,000"}, {1'000'000, "1,000,000"}};
  for (const auto& [size, label] : kSizes) svg.text(x(size), top + kCurves - 10, label, "middle");
  std::size_t drawn = 0;
  for (const Growth& growth : growths()) {
    const std::vector<GrowthPoint> points = growth_of(measurements, growth.work, kOurs);
    if (points.size() < 2) continue;
    const char* colour = kColours[drawn % std::size(kColours)];
    std::vector<std::pair<double, double>> places;
    for (const GrowthPoint& point : points)
      places.emplace_back(x(static_cast<double>(point.entries)), y(point.to_base));
    svg.curve(places, colour);
    svg.text(kMargin, top + 45 + 22 * static_cast<double>(drawn++), growth.title, "start", colour);
  }
}

}  // namespace

void draw(const Measurements& measurements, std::ostream& out) {
  const std::vector<Result> all = results(measurements);
  const double growth_top = kTop + kRow * static_cast<double>(all.size()) + 50;
  Svg svg(out, growth_top + kCurves);
  draw_bars(svg, all);
  draw_growth(svg, measurements, growth_top);
}

}  // namespace quorvel::bench
