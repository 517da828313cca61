// Scales, their ticks, and a panel of a plot with axes around it.
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <vector>

#include "mixed/fit.hpp"
#include "mixed/model.hpp"
#include "mixed/svg.hpp"

namespace sm::mixed {

struct Range {
  double lo = 0.0;
  double hi = 1.0;
};

// From the smallest to the largest finite value; {0, 0} when there is none.
Range range_of(std::span<const double> values);

// Wider by a part of its length on both sides; one without length, about its point.
Range padded(Range range, double part = 0.04);

// Multiples of 1, 2 or 5 times a power of ten inside the range, about `count` of them.
std::vector<double> nice_ticks(Range range, int count);

// As many decimals as ticks of such a step need; powers of ten where that is unwieldy.
std::string tick_text(double value, double step);

std::string count_text(std::int64_t count);  // "10,000"

// A rectangle of the canvas with a linear scale either way.
class Panel {
 public:
  Panel(svg::Canvas& canvas, double left, double top, double width, double height, Range x, Range y)
      : canvas_(canvas), left_(left), top_(top), width_(width), height_(height), x_(x), y_(y) {}

  double x(double value) const { return left_ + (value - x_.lo) / (x_.hi - x_.lo) * width_; }
  double y(double value) const { return top_ + height_ - (value - y_.lo) / (y_.hi - y_.lo) * height_; }
  double left() const { return left_; }
  double right() const { return left_ + width_; }
  double top() const { return top_; }
  double bottom() const { return top_ + height_; }
  Range x_range() const { return x_; }
  Range y_range() const { return y_; }
  svg::Canvas& canvas() const { return canvas_; }

  // Grid lines, tick labels and the name of an axis. With `whole` no fractions are labelled; with `powers` the scale
  // holds decimal logarithms.
  void x_axis(const std::string& name, bool whole = false) const;
  void y_axis(const std::string& name, bool powers = false) const;
  // Above the panel, beginning so far to the left of it.
  void heading(const std::string& title, const std::string& note, double left_of = 0.0) const;

 private:
  svg::Canvas& canvas_;
  double left_;
  double top_;
  double width_;
  double height_;
  Range x_;
  Range y_;
};

// The plot's title and below it the formula of the model, in the uppermost kHeader pixels of every plot. A fit that did
// not converge is said to be one.
constexpr double kHeader = 58.0;
void header(svg::Canvas& canvas, const std::string& title, const Model& model, const Fit& fit);

// How many panels stand side by side: up to three, four by twos.
std::size_t panels_across(std::size_t panels);

}  // namespace sm::mixed
