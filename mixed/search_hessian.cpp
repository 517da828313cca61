// The Hessian that steps are taken with: from differences of the gradient where it has to be right, else as the caller
// approximates it, corrected by what steps have shown.
#include <algorithm>
#include <cmath>
#include <utility>

#include "mixed/search.hpp"

namespace sm::mixed {
namespace {

constexpr int kMostMisjudged = 4;  // steps, before an approximation is given up
// What steps longer than this teach about the Hessian is not true of the place where they end.
constexpr double kShort = 0.3;
constexpr double kMostChange = 3e-4;  // of the Hessian on a last short way, relative to its diagonal

}  // namespace

// Where the curvature is known, a small part of the distance over which the function changes by one.
double Search::difference_step(std::size_t i) const {
  if (scale_.empty()) return 1e-5 * natural(i);
  return std::clamp(1e-4 / scale_[i], 1e-7 * natural(i), 1e-3 * natural(i));
}

// The Hessian from forward differences of the gradient.
void Search::refresh() {
  const std::size_t m = x_.size();
  std::vector<double> h(m * m, 0.0);
  for (std::size_t j = 0; j < m; ++j) {
    Evaluation there;
    std::vector<double> y = x_;
    y[j] += difference_step(j);
    there = evaluate(y);
    if (!std::isfinite(there.value)) {
      y[j] = x_[j] - difference_step(j);
      there = evaluate(y);
    }
    const double step = y[j] - x_[j];
    for (std::size_t i = 0; i < m && std::isfinite(there.value); ++i) {
      const double slope = (there.gradient[i] - at_.gradient[i]) / step;
      h[j * m + i] += 0.5 * slope;
      h[i * m + j] += 0.5 * slope;
    }
  }
  hessian_ = std::move(h);
  correction_.clear();
  fresh_ = true;
  keep_radius_in_new_scale(std::exchange(scale_, curvature_scale(hessian_, naturals())));
}

std::vector<double> Search::approximation() const {
  if (!here_ || !options_.curvature || misjudged_ > kMostMisjudged) return {};
  std::vector<double> h = options_.curvature();
  if (!std::all_of(h.begin(), h.end(), [](double v) { return std::isfinite(v); })) h.clear();
  return h;
}

// After a last short step: changes the Hessian, from differences where the step began, by as many times what its
// approximation has changed as is seen along the step, where the gradients at both ends tell the Hessian in the
// middle. False when that is too much for what is left of the change to be nothing.
bool Search::follow_hessian(std::span<const double> p, std::span<const double> before) {
  if (approximation_.empty()) return true;
  std::vector<double> change = approximation();
  if (change.empty()) return false;
  double largest = 0.0;
  double along = 0.0;
  for (std::size_t j = 0; j < x_.size(); ++j) {
    for (std::size_t i = 0; i < x_.size(); ++i) {
      double& element = change[j * x_.size() + i];
      element -= std::exchange(approximation_[j * x_.size() + i], element);
      along += p[i] * p[j] * element;
      largest = std::max(largest, std::abs(element) / (scale_[i] * scale_[j]));
    }
  }
  const double curvature = dot(p, hessian_times(p));
  const double seen = 2.0 * (dot(p, at_.gradient) - dot(p, before) - curvature);
  double times = along == 0.0 ? 1.0 : seen / along;
  // Less than this is what differences leave in the Hessian.
  if (std::abs(seen) < 1e-5 * std::abs(curvature) || !(times > 0.1 && times < 10.0)) times = 1.0;
  for (std::size_t i = 0; i < change.size(); ++i) hessian_[i] += times * change[i];
  return times * largest <= kMostChange;
}

// The approximation of the Hessian, if there is one at x_, and what earlier steps have found missing in it.
bool Search::approximate() {
  approximation_ = approximation();
  if (approximation_.empty()) return false;
  hessian_ = approximation_;
  correction_.resize(hessian_.size(), 0.0);
  for (std::size_t i = 0; i < hessian_.size(); ++i) hessian_[i] += correction_[i];
  fresh_ = false;
  keep_radius_in_new_scale(std::exchange(scale_, curvature_scale(hessian_, naturals())));
  return true;
}

// The radius stands for the same part of the parameters, whatever they are scaled with. At first, for all of them.
void Search::keep_radius_in_new_scale(const std::vector<double>& old) {
  const std::vector<double> lengths = naturals();
  const double now = scaled_norm(lengths, scale_);
  radius_ = old.empty() ? now : radius_ * now / scaled_norm(lengths, old);
}

std::vector<double> Search::hessian_times(std::span<const double> p) const {
  std::vector<double> product(p.size(), 0.0);
  for (std::size_t j = 0; j < p.size(); ++j) {
    for (std::size_t i = 0; i < p.size(); ++i) product[i] += hessian_[j * p.size() + i] * p[j];
  }
  return product;
}

// The symmetric update of rank one, which learns negative curvature too, from the gradients at both ends of a step.
void Search::update(std::span<const double> p, std::span<const double> gradient, std::span<const double> before) {
  std::vector<double> rest = hessian_times(p);
  double size = 0.0;
  for (std::size_t i = 0; i < p.size(); ++i) {
    rest[i] = gradient[i] - before[i] - rest[i];
    size += rest[i] * rest[i] / (scale_[i] * scale_[i]);
  }
  const double along = dot(rest, p);
  if (std::abs(along) <= 1e-8 * std::sqrt(size) * scaled_norm(p, scale_)) return;
  correction_.resize(hessian_.size(), 0.0);
  for (std::size_t j = 0; j < p.size(); ++j) {
    for (std::size_t i = 0; i < p.size(); ++i) {
      hessian_[j * p.size() + i] += rest[i] * rest[j] / along;
      correction_[j * p.size() + i] += rest[i] * rest[j] / along;
    }
  }
  fresh_ = false;
}

// The approximation of the Hessian where a step has led, corrected by what the step has shown. `before`: the gradient
// where it began.
bool Search::renew_model(const TrialStep& step, std::span<const double> before) {
  if (fresh_) return false;
  const bool is_short = step.length <= kShort;
  if (!is_short) correction_.clear();
  if (!approximate()) return false;
  if (is_short) update(step.p, at_.gradient, before);
  return true;
}

}  // namespace sm::mixed
