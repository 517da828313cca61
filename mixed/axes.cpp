#include "mixed/axes.hpp"

#include <fmt/core.h>

#include <algorithm>
#include <cmath>

namespace sm::mixed {
namespace {

constexpr double kTickSize = 10.5;
constexpr double kNameSize = 11.5;
constexpr double kPixelsPerTick = 64.0;
constexpr double kBold = 1.08;  // times as wide as plain
constexpr const char* kMinus = "\u2212";

double step_of(const std::vector<double>& ticks) { return ticks.size() > 1 ? ticks[1] - ticks[0] : 1.0; }

// Whole powers only; every second, third, ... of many.
std::vector<double> power_ticks(Range range, int count) {
  const double stride = std::max(1.0, std::ceil((range.hi - range.lo) / std::max(count, 1)));
  std::vector<double> ticks;
  const double first = std::ceil(range.lo / stride) * stride;
  const int last = static_cast<int>(std::floor((range.hi - first) / stride));
  for (int i = 0; i <= last; ++i) ticks.push_back(first + i * stride + 0.0);  // never the zero with a sign
  return ticks;
}

std::string with_minus(std::string text) {
  const std::size_t place = text.find('-');
  if (place == 0) text.replace(0, 1, kMinus);
  return text;
}

}  // namespace

Range range_of(std::span<const double> values) {
  Range range{0.0, 0.0};
  bool empty = true;
  for (const double value : values) {
    if (!std::isfinite(value)) continue;
    range.lo = empty ? value : std::min(range.lo, value);
    range.hi = empty ? value : std::max(range.hi, value);
    empty = false;
  }
  return range;
}

Range padded(Range range, double part) {
  const double length = range.hi - range.lo;
  const double size = std::max(std::fabs(range.lo), std::fabs(range.hi));
  // Values that differ by rounding alone count as one.
  if (!(length > 1e-12 * size)) {
    const double about = size > 0.0 ? 0.5 * size : 1.0;
    return {range.lo - about, range.hi + about};
  }
  return {range.lo - part * length, range.hi + part * length};
}

std::vector<double> nice_ticks(Range range, int count) {
  const double raw = (range.hi - range.lo) / std::max(count, 1);
  if (!(raw > 0.0) || !std::isfinite(raw)) return {range.lo};
  const double power = std::pow(10.0, std::floor(std::log10(raw)));
  const double lead = raw / power;
  const double step = (lead < 1.5 ? 1.0 : lead < 3.5 ? 2.0 : lead < 7.5 ? 5.0 : 10.0) * power;
  std::vector<double> ticks;
  const double slack = 1e-9;
  const double first = std::ceil(range.lo / step - slack);
  const int more = static_cast<int>(std::floor(range.hi / step + slack) - first);
  for (int i = 0; i <= more; ++i) {
    const double k = first + i;
    ticks.push_back(k == 0.0 ? 0.0 : k * step);
  }
  return ticks;
}

std::string tick_text(double value, double step) {
  constexpr double kLargest = 1e6;
  constexpr int kMostDecimals = 4;
  const int decimals = std::max(0, -static_cast<int>(std::floor(std::log10(step) + 1e-9)));
  if (value == 0.0) return "0";
  if (std::fabs(value) < kLargest && decimals <= kMostDecimals) {
    return with_minus(fmt::format("{:.{}f}", value, decimals));
  }
  const auto exponent = [](double size) { return static_cast<int>(std::floor(std::log10(size) + 1e-9)); };
  const int digits = std::max(1, 1 + exponent(std::fabs(value)) - exponent(step));
  return with_minus(fmt::format("{:.{}g}", value, digits));
}

std::string count_text(std::int64_t count) {
  std::string text = fmt::format("{}", count);
  constexpr int kGroup = 3;
  for (std::int64_t place = static_cast<std::int64_t>(text.size()) - kGroup; place > (count < 0 ? 1 : 0);
       place -= kGroup) {
    text.insert(static_cast<std::size_t>(place), 1, ',');
  }
  return text;
}

void Panel::x_axis(const std::string& name, bool whole) const {
  std::vector<double> ticks = nice_ticks(x_, std::max(2, static_cast<int>(width_ / kPixelsPerTick)));
  if (whole) std::erase_if(ticks, [](double tick) { return tick != std::round(tick); });
  for (const double tick : ticks) {
    canvas_.line(x(tick), top_, x(tick), bottom(), svg::kGrid);
    canvas_.text(x(tick), bottom() + 15.0, tick_text(tick, step_of(ticks)),
                 {.size = kTickSize, .anchor = svg::Anchor::middle, .fill = svg::kMuted});
  }
  canvas_.line(left_, bottom(), right(), bottom(), svg::kRule);
  canvas_.text(left_ + 0.5 * width_, bottom() + 33.0, svg::fitted(name, kNameSize, width_ + 40.0),
               {.size = kNameSize, .anchor = svg::Anchor::middle});
}

void Panel::y_axis(const std::string& name, bool powers) const {
  const int count = std::max(2, static_cast<int>(height_ / (0.7 * kPixelsPerTick)));
  const std::vector<double> ticks = powers ? power_ticks(y_, count) : nice_ticks(y_, count);
  double widest = 0.0;
  for (const double tick : ticks) {
    const std::string text = powers ? with_minus(fmt::format("1e{:.0f}", tick)) : tick_text(tick, step_of(ticks));
    widest = std::max(widest, svg::text_width(text, kTickSize));
    canvas_.line(left_, y(tick), right(), y(tick), svg::kGrid);
    canvas_.text(left_ - 6.0, y(tick) + 3.5, text,
                 {.size = kTickSize, .anchor = svg::Anchor::end, .fill = svg::kMuted});
  }
  canvas_.line(left_, top_, left_, bottom(), svg::kRule);
  const double place = std::max(12.0, left_ - 16.0 - widest);
  canvas_.text(place, top_ + 0.5 * height_, svg::fitted(name, kNameSize, height_ + 40.0),
               {.size = kNameSize, .anchor = svg::Anchor::middle, .upwards = true});
}

void Panel::heading(const std::string& title, const std::string& note, double left_of) const {
  constexpr double kTitleSize = 12.0;
  constexpr double kNoteSize = 10.5;
  const double left = left_ - left_of;
  const double width = width_ + left_of;
  canvas_.text(left, top_ - 24.0, svg::fitted(title, kTitleSize * kBold, width), {.size = kTitleSize, .bold = true});
  canvas_.text(left, top_ - 9.0, svg::fitted(note, kNoteSize, width), {.size = kNoteSize, .fill = svg::kMuted});
}

void header(svg::Canvas& canvas, const std::string& title, const Model& model, const Fit& fit) {
  constexpr double kTitleSize = 16.0;
  constexpr double kBelowSize = 11.5;
  constexpr double kMargin = 20.0;
  const double width = canvas.width() - 2.0 * kMargin;
  canvas.text(kMargin, 27.0, svg::fitted(title, kTitleSize * kBold, width), {.size = kTitleSize, .bold = true});
  const bool doubtful = fit.convergence != Convergence::converged && !fit.variances_given;
  canvas.text(kMargin, 46.0, svg::fitted((doubtful ? "NOT CONVERGED: " : "") + model.formula, kBelowSize, width),
              {.size = kBelowSize, .fill = svg::kMuted});
}

std::size_t panels_across(std::size_t panels) {
  constexpr std::size_t kMost = 3;
  return panels == 4 ? 2 : std::min(panels, kMost);
}

}  // namespace sm::mixed
