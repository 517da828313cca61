#include "mixed/trust_region.hpp"

#include <algorithm>
#include <cmath>

#include "mixed/dense.hpp"
#include "mixed/vectors.hpp"

namespace sm::mixed {
namespace {

// The curvatures that a step reckons with: what is not told apart from zero is taken as slightly positive.
std::vector<double> firm_curvatures(const Spectrum& spectrum) {
  std::vector<double> values = spectrum.values;
  for (double& value : values) {
    if (std::abs(value) < kFlat) value = kFlat;
  }
  return values;
}

// D^-1 H D^-1.
Dense scaled(std::span<const double> hessian, std::span<const double> scale) {
  Dense result(hessian.begin(), hessian.end());
  const std::size_t n = scale.size();
  for (std::size_t j = 0; j < n; ++j) {
    for (std::size_t i = 0; i < n; ++i) result[j * n + i] /= scale[i] * scale[j];
  }
  return result;
}

// The gradient in the basis of the eigenvectors.
std::vector<double> components(const Spectrum& spectrum, std::span<const double> gradient) {
  std::vector<double> c(spectrum.order(), 0.0);
  for (std::size_t j = 0; j < c.size(); ++j) {
    const std::vector<double> direction = spectrum.direction(j);
    c[j] = dot(direction, gradient);
  }
  return c;
}

// -c / (values + mu), with nothing along what this makes infinite.
std::vector<double> shifted_step(std::span<const double> c, std::span<const double> values, double mu) {
  std::vector<double> y(c.size());
  for (std::size_t j = 0; j < y.size(); ++j) {
    const double curvature = values[j] + mu;
    y[j] = c[j] == 0.0 || curvature <= 0.0 ? 0.0 : -c[j] / curvature;
  }
  return y;
}

// The shift that makes the step as long as the radius: the length falls with the shift.
std::vector<double> step_on_border(std::span<const double> c, std::span<const double> values, double radius) {
  const double least = std::max(0.0, -values[0]);
  double low = least;
  double high = least + norm(c) / radius;
  for (int k = 0; k < 200 && low < high; ++k) {
    const double middle = 0.5 * (low + high);
    if (middle <= low || middle >= high) break;
    (norm(shifted_step(c, values, middle)) > radius ? low : high) = middle;
  }
  std::vector<double> y = shifted_step(c, values, high);
  const double missing = radius * radius - dot(y, y);
  // The hard case: no shift makes it long enough, and downhill is either way along the lowest curvature.
  if (values[0] < 0.0 && missing > 0.0) y[0] += (c[0] > 0.0 ? -1.0 : 1.0) * std::sqrt(missing);
  const double length = norm(y);
  if (length > radius) {
    for (double& element : y) element *= radius / length;
  }
  return y;
}

}  // namespace

std::vector<double> Spectrum::direction(std::size_t j) const {
  std::vector<double> p(order());
  for (std::size_t i = 0; i < p.size(); ++i) p[i] = vectors[j * order() + i] / scale[i];
  return p;
}

std::vector<double> curvature_scale(std::span<const double> hessian, std::span<const double> natural) {
  constexpr double kLeast = 1e-6;  // a change of a parameter by its own length that moves the function by less is none
  const std::size_t n = natural.size();
  std::vector<double> reciprocal(n);
  for (std::size_t i = 0; i < n; ++i) reciprocal[i] = 1.0 / natural[i];
  // On the way to infinity there is no scale, eigenvalues are not numbers, and nothing that is compared with one counts
  // as small.
  const Eigensystem eigen = eigensystem(scaled(hessian, reciprocal), n);
  std::vector<double> scale(n);
  for (std::size_t i = 0; i < n; ++i) {
    double diagonal = 0.0;
    for (std::size_t j = 0; j < n; ++j) {
      diagonal += eigen.vectors[j * n + i] * eigen.vectors[j * n + i] * std::abs(eigen.values[j]);
    }
    scale[i] = std::sqrt(diagonal < kLeast ? kLeast : diagonal) / natural[i];
  }
  return scale;
}

Spectrum decompose(std::span<const double> hessian, std::span<const double> scale) {
  Eigensystem eigen = eigensystem(scaled(hessian, scale), scale.size());
  return {
      .scale = {scale.begin(), scale.end()}, .values = std::move(eigen.values), .vectors = std::move(eigen.vectors)};
}

double newton_decrement(const Spectrum& spectrum, std::span<const double> gradient) {
  const std::vector<double> c = components(spectrum, gradient);
  const std::vector<double> values = firm_curvatures(spectrum);
  double sum = 0.0;
  for (std::size_t j = 0; j < c.size(); ++j) sum += c[j] * c[j] / std::abs(values[j]);
  return sum;
}

TrialStep trust_region_step(const Spectrum& spectrum, std::span<const double> gradient, double radius) {
  const std::vector<double> c = components(spectrum, gradient);
  const std::vector<double> values = firm_curvatures(spectrum);
  std::vector<double> y = shifted_step(c, values, 0.0);
  const bool bounded = values[0] < 0.0 || norm(y) > radius;
  if (bounded) y = step_on_border(c, values, radius);
  TrialStep step{.p = std::vector<double>(c.size(), 0.0), .length = norm(y), .predicted = 0.0, .bounded = bounded};
  for (std::size_t j = 0; j < y.size(); ++j) {
    const std::vector<double> direction = spectrum.direction(j);
    for (std::size_t i = 0; i < y.size(); ++i) step.p[i] += y[j] * direction[i];
    step.predicted -= (c[j] + 0.5 * values[j] * y[j]) * y[j];
  }
  return step;
}

}  // namespace sm::mixed
