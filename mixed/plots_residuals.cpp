// Residuals against fitted values: dots where they are few, hexagons shaded by their number where they are many.
#include <fmt/core.h>

#include <algorithm>
#include <cmath>
#include <iterator>
#include <map>
#include <numbers>
#include <utility>

#include "mixed/axes.hpp"
#include "mixed/plots.hpp"

namespace sm::mixed {
namespace {

constexpr std::size_t kMostDots = 5'000;
constexpr double kWidth = 700.0;
constexpr double kHeight = 500.0;

struct Point {
  double x;
  double y;
};

std::vector<Point> finite_points(const Fit& fit) {
  std::vector<Point> points;
  for (std::size_t i = 0; i < std::min(fit.fitted.size(), fit.residuals.size()); ++i) {
    if (std::isfinite(fit.fitted[i]) && std::isfinite(fit.residuals[i])) {
      points.push_back({fit.fitted[i], fit.residuals[i]});
    }
  }
  std::sort(points.begin(), points.end(), [](const Point& a, const Point& b) { return a.x < b.x; });
  return points;
}

// Locally weighted straight lines with tricube weights over two thirds of the points, without robustness steps: W. S.
// Cleveland, "Robust locally weighted regression and smoothing scatterplots", J. Amer. Statist. Assoc. 74 (1979)
// 829-836.
std::vector<Point> smoothed(const std::vector<Point>& points) {
  constexpr std::size_t kFewest = 30;
  constexpr int kPlaces = 60;
  const double lo = points.empty() ? 0.0 : points.front().x;
  const double hi = points.empty() ? 0.0 : points.back().x;
  std::vector<Point> line;
  if (points.size() < kFewest || !(hi > lo)) return line;
  const std::size_t near = points.size() * 2 / 3;
  std::size_t first = 0;
  for (int place = 0; place <= kPlaces; ++place) {
    const double at = lo + (hi - lo) * place / kPlaces;
    // The window of the nearest points moves to the right with the place.
    while (first + near < points.size() && points[first + near].x - at < at - points[first].x) ++first;
    const double reach = std::max(at - points[first].x, points[first + near - 1].x - at) * (1.0 + 1e-9);
    double w = 0.0, wx = 0.0, wy = 0.0, wxx = 0.0, wxy = 0.0;
    for (std::size_t i = first; i < first + near; ++i) {
      const double x = (points[i].x - at) / reach;
      const double cube = 1.0 - std::fabs(x * x * x);
      const double weight = std::max(0.0, cube * cube * cube);
      w += weight;
      wx += weight * x;
      wy += weight * points[i].y;
      wxx += weight * x * x;
      wxy += weight * x * points[i].y;
    }
    const double det = w * wxx - wx * wx;
    if (!(w > 0.0)) continue;
    line.push_back({at, det > 1e-9 * w * wxx ? (wxx * wy - wx * wxy) / det : wy / w});
  }
  return line;
}

// Every so many of the points where there are more than a smooth line needs.
std::vector<Point> thinned(const std::vector<Point>& points) {
  constexpr std::size_t kEnough = 20'000;
  const std::size_t stride = points.size() / kEnough + 1;
  std::vector<Point> some;
  for (std::size_t i = stride / 2; i < points.size(); i += stride) some.push_back(points[i]);
  return some;
}

void draw_dots(const Panel& panel, const std::vector<Point>& points) {
  constexpr std::size_t kFew = 500;
  const bool few = points.size() <= kFew;
  panel.canvas().begin_circles(svg::kAccent, few ? 0.6 : 0.35);
  for (const Point& point : points) panel.canvas().circle(panel.x(point.x), panel.y(point.y), few ? 2.8 : 2.0);
  panel.canvas().end_group();
}

constexpr double kHexagon = 6.0;  // from the centre to a corner

// Counts by hexagon: rows of hexagons that stand on a corner, every other row shifted by half a hexagon.
std::map<std::pair<int, int>, std::int64_t> hexagon_counts(const Panel& panel, const std::vector<Point>& points) {
  const double wide = kHexagon * std::numbers::sqrt3;
  const double high = 1.5 * kHexagon;
  std::map<std::pair<int, int>, std::int64_t> counts;
  for (const Point& point : points) {
    const double x = panel.x(point.x) - panel.left();
    const double y = panel.y(point.y) - panel.top();
    const int near = static_cast<int>(std::lround(y / high));
    std::pair<int, int> best{0, 0};
    double smallest = 1e300;
    for (int row = near - 1; row <= near + 1; ++row) {
      const double shift = row % 2 != 0 ? 0.5 : 0.0;
      const int column = static_cast<int>(std::lround(x / wide - shift));
      const double distance = std::hypot(x - (column + shift) * wide, y - row * high);
      if (distance < smallest) best = {row, column};
      smallest = std::min(smallest, distance);
    }
    ++counts[best];
  }
  return counts;
}

std::string hexagon_path(double x, double y) {
  const double half = 0.5 * kHexagon * std::numbers::sqrt3;
  return fmt::format("M{:.1f} {:.1f}l{:.2f} {:.2f}v{:.2f}l{:.2f} {:.2f}l{:.2f} {:.2f}v{:.2f}z", x, y - kHexagon, half,
                     0.5 * kHexagon, kHexagon, -half, 0.5 * kHexagon, -half, -0.5 * kHexagon, -kHexagon);
}

// Classes of counts that grow by a constant factor, the paler the fewer.
constexpr int kShades = 6;
double opacity(int shade) { return 0.14 + 0.86 * shade / (kShades - 1); }

// From how many observations on a hexagon has each shade, of those that occur.
void draw_legend(const Panel& panel, double factor, std::int64_t most) {
  const double x = panel.right() + 16.0;
  double y = panel.top() + 40.0;
  panel.canvas().text(panel.right() + 10.0, panel.top() + 14.0, "observations", {.size = 10.5, .fill = svg::kMuted});
  const auto from = [&](int shade) {
    return static_cast<std::int64_t>(std::ceil(std::exp(factor * shade / kShades) - 1e-9));
  };
  for (int shade = 0; shade < kShades && from(shade) <= most; ++shade) {
    if (shade + 1 < kShades && from(shade + 1) == from(shade)) continue;  // no count has this one
    panel.canvas().fill_path(hexagon_path(x + 5.0, y - 4.0), svg::kAccent, opacity(shade));
    panel.canvas().text(x + 16.0, y, "≥ " + count_text(from(shade)), {.size = 10.5, .fill = svg::kMuted});
    y += 20.0;
  }
}

void draw_hexagons(const Panel& panel, const std::vector<Point>& points) {
  const auto counts = hexagon_counts(panel, points);
  std::int64_t most = 1;
  for (const auto& [place, count] : counts) most = std::max(most, count);
  const double factor = std::max(1e-9, std::log(static_cast<double>(most) + 1.0));
  std::string paths[kShades];
  for (const auto& [place, count] : counts) {
    const double x =
        panel.left() + (place.second + (place.first % 2 != 0 ? 0.5 : 0.0)) * kHexagon * std::numbers::sqrt3;
    const double y = panel.top() + place.first * 1.5 * kHexagon;
    const int shade = std::min(kShades - 1, static_cast<int>(kShades * std::log(static_cast<double>(count)) / factor));
    paths[shade] += hexagon_path(x, y);
  }
  for (int shade = 0; shade < kShades; ++shade) {
    if (!paths[shade].empty()) panel.canvas().fill_path(paths[shade], svg::kAccent, opacity(shade));
  }
  draw_legend(panel, factor, most);
}

void draw_line(const Panel& panel, const std::vector<Point>& line, bool with_halo) {
  std::string d;
  for (const Point& point : line) {
    const double y = std::clamp(panel.y(point.y), panel.top(), panel.bottom());
    fmt::format_to(std::back_inserter(d), "{}{} {}", d.empty() ? "M" : "L", svg::coordinate(panel.x(point.x)),
                   svg::coordinate(y));
  }
  if (d.empty()) return;
  if (with_halo) panel.canvas().stroke_path(d, "#ffffff", 4.0);
  panel.canvas().stroke_path(d, svg::kInk, 1.6);
  const double y = panel.top() - 10.0;
  panel.canvas().line(panel.right() - 120.0, y - 4.0, panel.right() - 98.0, y - 4.0, svg::kInk, 1.6);
  panel.canvas().text(panel.right() - 92.0, y, "local regression", {.size = 10.5, .fill = svg::kMuted});
}

}  // namespace

std::string residual_plot(const Model& model, const Fit& fit) {
  const std::vector<Point> points = finite_points(fit);
  svg::Canvas canvas(kWidth, kHeight, "Residuals against fitted values");
  header(canvas, "Residuals against fitted values", model, fit);
  std::vector<double> xs;
  std::vector<double> ys{0.0};
  for (const Point& point : points) {
    xs.push_back(point.x);
    ys.push_back(point.y);
  }
  const bool many = points.size() > kMostDots;
  constexpr double kLeft = 76.0;
  const double right = many ? 106.0 : 24.0;
  const Panel panel(canvas, kLeft, kHeader + 24.0, kWidth - kLeft - right, kHeight - kHeader - 24.0 - 50.0,
                    padded(range_of(xs)), padded(range_of(ys)));
  panel.x_axis("fitted " + model.response);
  panel.y_axis("residual");
  if (many) {
    draw_hexagons(panel, points);
  } else {
    draw_dots(panel, points);
  }
  canvas.line(panel.left(), panel.y(0.0), panel.right(), panel.y(0.0), svg::kRule);
  draw_line(panel, smoothed(thinned(points)), many);
  canvas.text(
      panel.left(), panel.top() - 10.0,
      count_text(static_cast<std::int64_t>(points.size())) + (points.size() == 1 ? " observation" : " observations"),
      {.size = 10.5, .fill = svg::kMuted});
  return canvas.finished();
}

}  // namespace sm::mixed
