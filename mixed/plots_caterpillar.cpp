// Random effects in order of their size, a row for each level and a panel for each coefficient of each group.
#include <fmt/core.h>

#include <algorithm>
#include <cmath>
#include <iterator>

#include "mixed/axes.hpp"
#include "mixed/plots.hpp"

namespace sm::mixed {
namespace {

constexpr std::size_t kMostRows = 150;   // more levels than that are thinned
constexpr std::size_t kThinnedTo = 100;  // to so many
constexpr std::size_t kMostPanels = 12;
constexpr double kWidestLabel = 180.0;
constexpr double kNarrowest = 520.0;
constexpr double kAbove = 46.0;  // for a panel's heading
constexpr double kBelow = 46.0;  // for its axis
constexpr double kMargin = 20.0;
constexpr double kNormal95 = 1.959963984540054;

// The levels that are shown of one coefficient, the smallest effect first.
std::vector<std::size_t> shown_levels(const RandomEffects& effects) {
  std::vector<std::size_t> order;
  for (std::size_t i = 0; i < effects.estimate.size(); ++i) {
    if (std::isfinite(effects.estimate[i])) order.push_back(i);
  }
  std::stable_sort(order.begin(), order.end(),
                   [&](std::size_t a, std::size_t b) { return effects.estimate[a] < effects.estimate[b]; });
  if (order.size() <= kMostRows) return order;
  std::vector<std::size_t> thinned;
  for (std::size_t i = 0; i < kThinnedTo; ++i) thinned.push_back(order[i * (order.size() - 1) / (kThinnedTo - 1)]);
  return thinned;
}

// A panel by itself has the room of two.
double plot_width(std::size_t panels) { return panels == 1 ? 420.0 : 270.0; }

double row_height(std::size_t rows) {
  constexpr double kComfortable = 420.0;
  return std::clamp(kComfortable / static_cast<double>(rows), 9.0, 20.0);
}

double panel_height(std::size_t rows) {
  constexpr double kLowest = 60.0;
  return std::max(kLowest, row_height(rows) * static_cast<double>(rows));
}

struct Placed {
  const RandomEffects* effects = nullptr;
  std::vector<std::size_t> levels;
  double label_width = 0.0;
  double left = 0.0;
  double top = 0.0;
  double width = 0.0;  // without the labels
};

double label_size(std::size_t rows) { return std::min(10.5, row_height(rows) - 1.0); }

double label_width(const RandomEffects& effects, const std::vector<std::size_t>& levels) {
  double widest = 20.0;
  for (const std::size_t level : levels) {
    widest = std::max(widest, svg::text_width(effects.levels[level], label_size(levels.size())) + 8.0);
  }
  return std::min(widest, kWidestLabel);
}

bool has_intervals(const RandomEffects& effects) { return effects.pev_sd.size() == effects.estimate.size(); }

Range range_of_rows(const Placed& panel) {
  std::vector<double> ends{0.0};
  for (const std::size_t level : panel.levels) {
    const double half = has_intervals(*panel.effects) ? kNormal95 * panel.effects->pev_sd[level] : 0.0;
    ends.push_back(panel.effects->estimate[level] - half);
    ends.push_back(panel.effects->estimate[level] + half);
  }
  return padded(range_of(ends));
}

std::string note_of(const Placed& panel) {
  const auto all = static_cast<std::int64_t>(panel.effects->estimate.size());
  std::string note = count_text(all) + (all == 1 ? " level" : " levels");
  if (panel.levels.size() < panel.effects->estimate.size()) {
    note = fmt::format("{} of {}, evenly by rank", panel.levels.size(), note);
  }
  const auto is_zero = [](double value) { return value == 0.0; };
  const bool all_zero = std::all_of(panel.effects->estimate.begin(), panel.effects->estimate.end(), is_zero);
  return all_zero ? note + "; the variance is zero" : note;
}

void draw(svg::Canvas& canvas, const Placed& placed) {
  const RandomEffects& effects = *placed.effects;
  const std::size_t rows = placed.levels.size();
  const Panel panel(canvas, placed.left + placed.label_width, placed.top, placed.width, panel_height(rows),
                    range_of_rows(placed), {-0.5, static_cast<double>(rows) - 0.5});
  panel.x_axis("estimate");
  panel.heading(effects.group + " · " + effects.term, note_of(placed), placed.label_width);
  canvas.line(panel.x(0.0), panel.top(), panel.x(0.0), panel.bottom(), svg::kRule);
  std::string bars;
  const double size = label_size(rows);
  std::vector<std::string> names;
  for (const std::size_t level : placed.levels) names.push_back(effects.levels[level]);
  names = svg::told_apart(names, size, placed.label_width - 6.0);
  for (std::size_t row = 0; row < rows; ++row) {
    const std::size_t level = placed.levels[row];
    const double y = panel.y(static_cast<double>(row));
    canvas.text(panel.left() - 6.0, y + 0.35 * size, names[row],
                {.size = size, .anchor = svg::Anchor::end, .fill = svg::kMuted});
    if (!has_intervals(effects) || !std::isfinite(effects.pev_sd[level])) continue;
    const double half = kNormal95 * effects.pev_sd[level];
    fmt::format_to(std::back_inserter(bars), "M{} {}H{}", svg::coordinate(panel.x(effects.estimate[level] - half)),
                   svg::coordinate(y), svg::coordinate(panel.x(effects.estimate[level] + half)));
  }
  const double thick = std::min(4.0, 0.35 * row_height(rows));
  if (!bars.empty()) canvas.stroke_path(bars, svg::kPale, thick);
  canvas.begin_circles(svg::kAccent, 1.0);
  for (std::size_t row = 0; row < rows; ++row) {
    canvas.circle(panel.x(effects.estimate[placed.levels[row]]), panel.y(static_cast<double>(row)), 0.75 * thick);
  }
  canvas.end_group();
}

}  // namespace

std::string caterpillar_plot(const Model& model, const Fit& fit) {
  std::vector<Placed> panels;
  for (const RandomEffects& effects : fit.ranef) {
    if (panels.size() == kMostPanels) break;
    Placed panel{.effects = &effects, .levels = shown_levels(effects)};
    if (panel.levels.empty()) continue;
    panel.label_width = label_width(effects, panel.levels);
    panels.push_back(std::move(panel));
  }
  double top = kHeader;
  double width = kNarrowest;
  const std::size_t across = panels_across(panels.size());
  for (std::size_t first = 0; first < panels.size(); first += across) {
    double left = kMargin;
    double height = 0.0;
    for (std::size_t i = first; i < std::min(first + across, panels.size()); ++i) {
      panels[i].left = left;
      panels[i].top = top + kAbove;
      panels[i].width = plot_width(panels.size());
      left += panels[i].label_width + panels[i].width + kMargin;
      height = std::max(height, panel_height(panels[i].levels.size()));
    }
    top += kAbove + height + kBelow;
    width = std::max(width, left);
  }
  svg::Canvas canvas(width, panels.empty() ? top + 60.0 : top, "Random effects");
  const bool intervals =
      std::any_of(panels.begin(), panels.end(), [](const Placed& panel) { return has_intervals(*panel.effects); });
  header(canvas, intervals ? "Random effects with 95 % prediction intervals" : "Random effects", model, fit);
  if (panels.empty()) canvas.text(kMargin, top + 20.0, "There are no random effects.", {.size = 12.0});
  for (const Placed& panel : panels) draw(canvas, panel);
  return canvas.finished();
}

}  // namespace sm::mixed
