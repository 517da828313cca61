#include "mixed/trust_region.hpp"

#include <Eigen/Dense>
#include <algorithm>
#include <cmath>

namespace sm::mixed {
namespace {

using Map = Eigen::Map<const Eigen::MatrixXd>;
using VectorMap = Eigen::Map<const Eigen::VectorXd>;

VectorMap vector_of(std::span<const double> v) { return {v.data(), static_cast<Eigen::Index>(v.size())}; }

// The curvatures that a step reckons with: what is not told apart from zero is taken as slightly positive.
Eigen::VectorXd firm_curvatures(const Spectrum& spectrum) {
  Eigen::VectorXd values = vector_of(spectrum.values);
  for (double& value : values) {
    if (std::abs(value) < kFlat) value = kFlat;
  }
  return values;
}

// The gradient in the basis of the eigenvectors.
Eigen::VectorXd components(const Spectrum& spectrum, std::span<const double> gradient) {
  const auto n = static_cast<Eigen::Index>(spectrum.order());
  return Map(spectrum.vectors.data(), n, n).transpose() * vector_of(gradient).cwiseQuotient(vector_of(spectrum.scale));
}

// -c / (values + mu), with nothing along what this makes infinite.
Eigen::VectorXd shifted_step(const Eigen::VectorXd& c, const Eigen::VectorXd& values, double mu) {
  Eigen::VectorXd y(c.size());
  for (Eigen::Index j = 0; j < c.size(); ++j) {
    const double curvature = values[j] + mu;
    y[j] = c[j] == 0.0 || curvature <= 0.0 ? 0.0 : -c[j] / curvature;
  }
  return y;
}

// The shift that makes the step as long as the radius: the length falls with the shift.
Eigen::VectorXd step_on_border(const Eigen::VectorXd& c, const Eigen::VectorXd& values, double radius) {
  const double least = std::max(0.0, -values[0]);
  double low = least;
  double high = least + c.norm() / radius;
  for (int k = 0; k < 200 && low < high; ++k) {
    const double middle = 0.5 * (low + high);
    if (middle <= low || middle >= high) break;
    (shifted_step(c, values, middle).norm() > radius ? low : high) = middle;
  }
  Eigen::VectorXd y = shifted_step(c, values, high);
  const double missing = radius * radius - y.squaredNorm();
  // The hard case: no shift makes it long enough, and downhill is either way along the lowest curvature.
  if (values[0] < 0.0 && missing > 0.0) y[0] += (c[0] > 0.0 ? -1.0 : 1.0) * std::sqrt(missing);
  if (y.norm() > radius) y *= radius / y.norm();
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
  const auto n = static_cast<Eigen::Index>(natural.size());
  const VectorMap length = vector_of(natural);
  const Eigen::MatrixXd scaled = length.asDiagonal() * Map(hessian.data(), n, n) * length.asDiagonal();
  // On the way to infinity there is no scale, and nothing that is compared with one counts as small.
  if (!scaled.allFinite()) return std::vector<double>(natural.size(), std::nan(""));
  const Eigen::SelfAdjointEigenSolver<Eigen::MatrixXd> solver(scaled);
  const Eigen::VectorXd diagonal = solver.eigenvectors().cwiseAbs2() * solver.eigenvalues().cwiseAbs();
  std::vector<double> scale(natural.size());
  for (Eigen::Index i = 0; i < n; ++i) {
    scale[static_cast<std::size_t>(i)] = std::sqrt(std::max(diagonal[i], kLeast)) / length[i];
  }
  return scale;
}

Spectrum decompose(std::span<const double> hessian, std::span<const double> scale) {
  const auto n = static_cast<Eigen::Index>(scale.size());
  const Eigen::VectorXd inverse = vector_of(scale).cwiseInverse();
  const Eigen::MatrixXd scaled = inverse.asDiagonal() * Map(hessian.data(), n, n) * inverse.asDiagonal();
  const Eigen::SelfAdjointEigenSolver<Eigen::MatrixXd> solver(scaled);
  const Eigen::VectorXd& values = solver.eigenvalues();
  const Eigen::MatrixXd& vectors = solver.eigenvectors();
  return {.scale = {scale.begin(), scale.end()},
          .values = {values.data(), values.data() + n},
          .vectors = {vectors.data(), vectors.data() + n * n}};
}

double newton_decrement(const Spectrum& spectrum, std::span<const double> gradient) {
  const Eigen::VectorXd c = components(spectrum, gradient);
  return c.cwiseAbs2().cwiseQuotient(firm_curvatures(spectrum).cwiseAbs()).sum();
}

TrialStep trust_region_step(const Spectrum& spectrum, std::span<const double> gradient, double radius) {
  const Eigen::VectorXd c = components(spectrum, gradient);
  const Eigen::VectorXd values = firm_curvatures(spectrum);
  Eigen::VectorXd y = shifted_step(c, values, 0.0);
  const bool bounded = values[0] < 0.0 || y.norm() > radius;
  if (bounded) y = step_on_border(c, values, radius);
  const auto n = static_cast<Eigen::Index>(spectrum.order());
  const Eigen::VectorXd p = (Map(spectrum.vectors.data(), n, n) * y).cwiseQuotient(vector_of(spectrum.scale));
  return {.p = {p.data(), p.data() + n},
          .length = y.norm(),
          .predicted = -(c.dot(y) + 0.5 * values.dot(y.cwiseAbs2())),
          .bounded = bounded};
}

}  // namespace sm::mixed
