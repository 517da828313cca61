// Normal quantiles: of the standardised residuals, and of the random effects, a panel for each coefficient.
#include <algorithm>
#include <cmath>

#include "mixed/axes.hpp"
#include "mixed/distributions.hpp"
#include "mixed/plots.hpp"
#include "mixed/summary_tables.hpp"

namespace sm::mixed {
namespace {

constexpr std::size_t kMostPanels = 12;
constexpr std::size_t kMostDots = 1'500;
constexpr double kSide = 290.0;
constexpr double kLeft = 68.0;
constexpr double kAbove = 46.0;
constexpr double kBelow = 52.0;
constexpr double kMargin = 20.0;

struct Sample {
  std::string title;
  std::string axis;
  std::vector<double> values;  // ascending
};

Sample sample_of(const std::string& title, const std::string& axis, const std::vector<double>& values) {
  Sample sample{.title = title, .axis = axis, .values = {}};
  std::copy_if(values.begin(), values.end(), std::back_inserter(sample.values),
               [](double v) { return std::isfinite(v); });
  std::sort(sample.values.begin(), sample.values.end());
  return sample;
}

// The normal quantile that the i-th of n ordered values is held against: the middle of its step.
double normal_place(std::size_t i, std::size_t n) {
  return normal_quantile((static_cast<double>(i) + 0.5) / static_cast<double>(n));
}

// Which of n ordered values are drawn. Of many, those at even distances along the axis, so that the tails stay whole.
std::vector<std::size_t> shown(std::size_t n) {
  std::vector<std::size_t> places;
  if (n <= kMostDots) {
    for (std::size_t i = 0; i < n; ++i) places.push_back(i);
    return places;
  }
  const double end = -normal_place(0, n);
  for (std::size_t k = 0; k <= kMostDots; ++k) {
    const double z = -end + 2.0 * end * static_cast<double>(k) / kMostDots;
    const double p = 0.5 * std::erfc(-z / std::sqrt(2.0));
    const double place = std::clamp(p * static_cast<double>(n) - 0.5, 0.0, static_cast<double>(n - 1));
    const auto i = static_cast<std::size_t>(std::lround(place));
    if (places.empty() || places.back() < i) places.push_back(i);
  }
  return places;
}

// Through the quartiles, which a few outliers do not move.
void draw_reference(const Panel& panel, const std::vector<double>& values) {
  constexpr double kQuartile = 0.6744897501960817;
  const auto at = [&](double p) {
    const double place = p * static_cast<double>(values.size() - 1);
    const auto i = static_cast<std::size_t>(place);
    const double next = values[std::min(i + 1, values.size() - 1)];
    return values[i] + (place - static_cast<double>(i)) * (next - values[i]);
  };
  const double slope = (at(0.75) - at(0.25)) / (2.0 * kQuartile);
  const double middle = 0.5 * (at(0.75) + at(0.25));
  if (!(slope > 0.0)) return;
  // Cut where it would leave the panel.
  const Range x = panel.x_range();
  const Range y = panel.y_range();
  const double from = std::max(x.lo, (y.lo - middle) / slope);
  const double to = std::min(x.hi, (y.hi - middle) / slope);
  if (from < to) {
    panel.canvas().line(panel.x(from), panel.y(middle + slope * from), panel.x(to), panel.y(middle + slope * to),
                        svg::kRule, 1.2);
  }
}

void draw(svg::Canvas& canvas, const Sample& sample, double left, double top) {
  const std::size_t n = sample.values.size();
  const double end = n > 0 ? std::max(0.5, -normal_place(0, n)) : 1.0;
  const Panel panel(canvas, left + kLeft, top + kAbove, kSide, kSide, padded({-end, end}),
                    padded(range_of(sample.values)));
  panel.x_axis("normal quantile");
  panel.y_axis(sample.axis);
  const bool constant = n > 0 && sample.values.front() == sample.values.back();
  panel.heading(sample.title, count_text(static_cast<std::int64_t>(n)) + (n == 1 ? " value" : " values") +
                                  (constant && n > 1 ? ", all the same" : ""));
  if (n > 1) draw_reference(panel, sample.values);
  canvas.begin_circles(svg::kAccent, n <= 200 ? 0.75 : 0.5);
  for (const std::size_t i : shown(n)) canvas.circle(panel.x(normal_place(i, n)), panel.y(sample.values[i]), 2.4);
  canvas.end_group();
}

}  // namespace

std::string quantile_plot(const Model& model, const Fit& fit) {
  std::vector<Sample> samples{sample_of("Residuals", "standardised residual", standardised_residuals(model, fit))};
  for (const RandomEffects& effects : fit.ranef) {
    if (samples.size() == kMostPanels) break;
    samples.push_back(sample_of(effects.group + " · " + effects.term, "estimate", effects.estimate));
  }
  const std::size_t across = panels_across(samples.size());
  const std::size_t down = (samples.size() + across - 1) / across;
  constexpr double kColumn = kLeft + kSide + kMargin;
  constexpr double kRow = kAbove + kSide + kBelow;
  svg::Canvas canvas(static_cast<double>(across) * kColumn + kMargin, kHeader + static_cast<double>(down) * kRow,
                     "Normal quantiles");
  header(canvas, "Normal quantiles", model, fit);
  for (std::size_t i = 0; i < samples.size(); ++i) {
    const auto column = static_cast<double>(i % across);
    const std::size_t row = i / across;
    draw(canvas, samples[i], column * kColumn, kHeader + static_cast<double>(row) * kRow);
  }
  return canvas.finished();
}

}  // namespace sm::mixed
