// The road of an optimizer: how far the criterion was above its end, and the largest scaled score, by iteration.
#include <fmt/core.h>

#include <algorithm>
#include <cmath>
#include <iterator>
#include <limits>

#include "mixed/axes.hpp"
#include "mixed/plots.hpp"

namespace sm::mixed {
namespace {

constexpr double kWidth = 640.0;
constexpr double kLeft = 84.0;
constexpr double kHigh = 190.0;
constexpr double kMargin = 24.0;
constexpr double kNothing = -std::numeric_limits<double>::infinity();  // the logarithm of zero

double log_of(double value) { return value > 0.0 && std::isfinite(value) ? std::log10(value) : kNothing; }

// The range of the powers that there are, from whole power to whole power.
Range range_of_powers(const std::vector<double>& powers) {
  const Range range = range_of(powers);
  const double lo = std::floor(range.lo);
  return {lo - 0.5, std::max(lo + 1.0, std::ceil(range.hi)) + 0.1};
}

void draw(svg::Canvas& canvas, double top, const std::vector<double>& powers, const std::string& title,
          const std::string& note, bool with_name) {
  const double last = std::max(1.0, static_cast<double>(powers.size()) - 1.0);
  const Panel panel(canvas, kLeft, top, kWidth - kLeft - kMargin, kHigh, {-0.03 * last, 1.03 * last},
                    range_of_powers(powers));
  panel.x_axis(with_name ? "iteration" : "", true);
  panel.y_axis("", true);
  panel.heading(title, note);
  std::string d;
  for (std::size_t i = 0; i < powers.size(); ++i) {
    if (!std::isfinite(powers[i])) continue;
    fmt::format_to(std::back_inserter(d), "{}{} {}", d.empty() ? "M" : "L",
                   svg::coordinate(panel.x(static_cast<double>(i))), svg::coordinate(panel.y(powers[i])));
  }
  if (!d.empty()) canvas.stroke_path(d, svg::kAccent, 1.5);
  constexpr std::size_t kFew = 60;
  const double radius = powers.size() <= kFew ? 3.2 : 1.6;
  canvas.begin_circles(svg::kAccent, 1.0);
  for (std::size_t i = 0; i < powers.size(); ++i) {
    if (std::isfinite(powers[i])) canvas.circle(panel.x(static_cast<double>(i)), panel.y(powers[i]), radius);
  }
  canvas.end_group();
  for (std::size_t i = 0; i < powers.size(); ++i) {
    if (!std::isfinite(powers[i])) canvas.ring(panel.x(static_cast<double>(i)), panel.bottom(), radius, svg::kAccent);
  }
}

}  // namespace

std::string criterion_plot(const Model& model, const Fit& fit) {
  const std::string title = fit.reml ? "REML criterion by iteration" : "-2 log likelihood by iteration";
  constexpr double kGap = 70.0;
  const bool nothing = fit.iterations.empty();
  svg::Canvas canvas(kWidth, nothing ? 120.0 : kHeader + 40.0 + kHigh + kGap + kHigh + 46.0, title);
  header(canvas, title, model, fit);
  if (nothing) {
    canvas.text(20.0, kHeader + 24.0,
                fit.variances_given ? "The variances are given: nothing was iterated." : "There were no iterations.",
                {.size = 12.0});
    return canvas.finished();
  }
  double best = std::numeric_limits<double>::infinity();
  for (const Iteration& iteration : fit.iterations) best = std::min(best, iteration.criterion);
  std::vector<double> excess;
  std::vector<double> score;
  for (const Iteration& iteration : fit.iterations) {
    excess.push_back(log_of(iteration.criterion - best));
    score.push_back(log_of(iteration.score));
  }
  // On a logarithmic scale the smallest value itself has no place.
  const std::string note = std::isfinite(best) ? fmt::format("open circles: at the smallest value, {:.6f}", best) : "";
  const double end = fit.iterations.back().score;
  draw(canvas, kHeader + 40.0, excess, "Criterion above its smallest value", note, false);
  draw(canvas, kHeader + 40.0 + kHigh + kGap, score, "Largest scaled score",
       std::isfinite(end) ? fmt::format("at the end {:.1e}", end) : "", true);
  return canvas.finished();
}

}  // namespace sm::mixed
