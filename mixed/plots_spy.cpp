// Where the entries of the mixed-model equations and of their factor are, each cell as dark as it is full.
#include <fmt/core.h>

#include <algorithm>
#include <cmath>
#include <iterator>

#include "mixed/axes.hpp"
#include "mixed/plots.hpp"

namespace sm::mixed {
namespace {

constexpr double kSide = 400.0;
constexpr double kMargin = 28.0;
constexpr double kAbove = 46.0;
constexpr std::int64_t kMostCells = 200;  // along a side
constexpr int kShades = 4;

// Counts of entries on a square grid, by rows.
struct Grid {
  std::int64_t side = 0;
  std::vector<std::int64_t> counts;
};

Grid counted(const SpyPattern& pattern, bool both_triangles) {
  Grid grid{.side = std::min(kMostCells, pattern.order), .counts = {}};
  grid.counts.assign(static_cast<std::size_t>(grid.side * grid.side), 0);
  const auto cell = [&](std::int64_t index) { return index * grid.side / pattern.order; };
  for (const auto& [row, col] : pattern.places) {
    if (row < 0 || col < 0 || row >= pattern.order || col >= pattern.order) continue;
    ++grid.counts[static_cast<std::size_t>(cell(row) * grid.side + cell(col))];
    if (both_triangles && row != col) ++grid.counts[static_cast<std::size_t>(cell(col) * grid.side + cell(row))];
  }
  return grid;
}

// Runs of cells of one shade, in cells; a unit high.
void add_runs(std::string* paths, const Grid& grid) {
  const std::int64_t most = *std::max_element(grid.counts.begin(), grid.counts.end());
  const double factor = std::log(static_cast<double>(most) + 1.0);
  const auto shade = [&](std::int64_t row, std::int64_t col) {
    const std::int64_t count = grid.counts[static_cast<std::size_t>(row * grid.side + col)];
    if (count == 0) return -1;
    if (most == 1) return kShades - 1;
    return std::min(kShades - 1, static_cast<int>(kShades * std::log(static_cast<double>(count)) / factor));
  };
  for (std::int64_t row = 0; row < grid.side; ++row) {
    for (std::int64_t col = 0; col < grid.side;) {
      const int here = shade(row, col);
      std::int64_t end = col + 1;
      while (end < grid.side && shade(row, end) == here) ++end;
      if (here >= 0) {
        fmt::format_to(std::back_inserter(paths[here]), "M{} {}h{}v1h-{}z", col, row, end - col, end - col);
      }
      col = end;
    }
  }
}

// White lines between cells that are large enough to be counted.
constexpr std::int64_t kMostSeparate = 60;
void separate_cells(svg::Canvas& canvas, const Panel& panel, std::int64_t side) {
  for (std::int64_t i = 1; i < side; ++i) {
    const double part = static_cast<double>(i) / static_cast<double>(side);
    canvas.line(panel.x(part), panel.top() + 1.0, panel.x(part), panel.bottom() - 1.0, "#ffffff");
    canvas.line(panel.left() + 1.0, panel.y(part), panel.right() - 1.0, panel.y(part), "#ffffff");
  }
}

void draw(svg::Canvas& canvas, double left, const SpyPattern& pattern, bool both_triangles, const std::string& title,
          const std::string& note) {
  const double top = kHeader + kAbove;
  const Panel panel(canvas, left, top, kSide, kSide, {0.0, 1.0}, {0.0, 1.0});
  panel.heading(title, note);
  canvas.frame(left, top, kSide, kSide, svg::kRule);
  if (pattern.places.empty() || pattern.order <= 0) {
    canvas.text(left + 0.5 * kSide, top + 0.5 * kSide, "no pattern was kept",
                {.anchor = svg::Anchor::middle, .fill = svg::kMuted});
    return;
  }
  const Grid grid = counted(pattern, both_triangles);
  std::string paths[kShades];
  add_runs(paths, grid);
  canvas.begin_scaled(left, top, kSide / static_cast<double>(grid.side));
  for (int shade = 0; shade < kShades; ++shade) {
    if (!paths[shade].empty()) canvas.fill_path(paths[shade], svg::kAccent, 0.4 + 0.6 * shade / (kShades - 1));
  }
  canvas.end_group();
  if (grid.side <= kMostSeparate) separate_cells(canvas, panel, grid.side);
  const auto shown = static_cast<std::int64_t>(pattern.places.size());
  std::string below = "order " + count_text(pattern.order);
  if (shown < pattern.entries) below += ", drawn from a sample of " + count_text(shown) + " entries";
  canvas.text(left, top + kSide + 18.0, below, {.size = 10.5, .fill = svg::kMuted});
}

}  // namespace

std::string spy_plot(const Model& model, const Fit& fit) {
  const std::string title = "Mixed-model equations and their factor";
  svg::Canvas canvas(3.0 * kMargin + 2.0 * kSide, kHeader + kAbove + kSide + 36.0, title);
  header(canvas, title, model, fit);
  const EquationFacts& facts = fit.equations;
  draw(canvas, kMargin, fit.spy_equations, true, "Equations",
       count_text(facts.entries) + " entries in the upper triangle");
  std::string note = count_text(facts.factor_entries) + " entries";
  if (facts.entries > 0) {
    const double ratio = static_cast<double>(facts.factor_entries) / static_cast<double>(facts.entries);
    note += fmt::format(", fill ratio {:.2f}", ratio);
  }
  draw(canvas, 2.0 * kMargin + kSide, fit.spy_factor, false, "Factor, in the order of elimination", note);
  return canvas.finished();
}

}  // namespace sm::mixed
