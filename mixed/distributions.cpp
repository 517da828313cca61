#include "mixed/distributions.hpp"

#include <cmath>
#include <limits>
#include <numbers>

namespace sm::mixed {
namespace {

constexpr double kNaN = std::numeric_limits<double>::quiet_NaN();

// log(Gamma(a + 1/2) / Gamma(a)). The difference of two logarithms of Gamma cancels where a is large; there the series
// of Tricomi and Erdelyi, "The asymptotic expansion of a ratio of Gamma functions", Pacific J. Math. 1 (1951) 133-142.
double log_gamma_half_step(double a) {
  constexpr double kSeriesFrom = 50.0;
  if (a < kSeriesFrom) return std::lgamma(a + 0.5) - std::lgamma(a);
  const double r = 1.0 / a;
  const double series =
      r * (-1.0 / 8 + r * (1.0 / 128 + r * (5.0 / 1024 + r * (-21.0 / 32768 + r * (-399.0 / 262144)))));
  return 0.5 * std::log(a) + std::log1p(series);
}

// The continued fraction of the incomplete beta function by the method of Lentz, Appl. Optics 15 (1976) 668-671; it
// takes some sqrt(max(a, b)) steps for x < (a + 1) / (a + b + 2).
double beta_fraction(double a, double b, double x) {
  constexpr double kTiny = 1e-300;
  constexpr double kEnough = 1e-16;
  constexpr int kSteps = 200'000;
  const auto away_from_zero = [](double v) { return std::fabs(v) < kTiny ? kTiny : v; };
  double c = 1.0;
  double d = 1.0 / away_from_zero(1.0 - (a + b) * x / (a + 1.0));
  double value = d;
  for (int m = 1; m < kSteps; ++m) {
    const double even = m * (b - m) * x / ((a + 2.0 * m - 1.0) * (a + 2.0 * m));
    d = 1.0 / away_from_zero(1.0 + even * d);
    c = away_from_zero(1.0 + even / c);
    value *= d * c;
    const double odd = -(a + m) * (a + b + m) * x / ((a + 2.0 * m) * (a + 2.0 * m + 1.0));
    d = 1.0 / away_from_zero(1.0 + odd * d);
    c = away_from_zero(1.0 + odd / c);
    value *= d * c;
    if (std::fabs(d * c - 1.0) <= kEnough) break;
  }
  return value;
}

}  // namespace

double student_two_sided(double t, double df) {
  if (std::isnan(t) || !(df > 0.0)) return kNaN;
  constexpr double kNormalFrom = 1e12;
  const double size = std::fabs(t);
  if (df > kNormalFrom) return std::erfc(size / std::numbers::sqrt2);
  if (std::isinf(size)) return 0.0;
  // P = I_x(df / 2, 1 / 2) with x = df / (df + t^2); y = 1 - x is formed without a difference.
  const double a = 0.5 * df;
  const double square = size * size;
  if (std::isinf(square)) return 0.0;
  const double x = df / (df + square);
  const double y = square / (df + square);
  // x^a y^(1/2) / B(a, 1/2)
  const double front = std::exp(log_gamma_half_step(a) - a * std::log1p(square / df)) * std::sqrt(y / std::numbers::pi);
  if (x < (a + 1.0) / (a + 2.5)) return front * beta_fraction(a, 0.5, x) / a;
  return 1.0 - front * beta_fraction(0.5, a, y) / 0.5;
}

double normal_quantile(double p) {
  if (!(p >= 0.0 && p <= 1.0)) return kNaN;
  if (p == 0.0) return -std::numeric_limits<double>::infinity();
  if (p == 1.0) return std::numeric_limits<double>::infinity();
  if (p > 0.5) return -normal_quantile(1.0 - p);
  // A start good to 4.5e-4 (Abramowitz and Stegun, Handbook of Mathematical Functions, 26.2.23), then Halley's steps.
  const double s = std::sqrt(-2.0 * std::log(p));
  double z = -(s - (2.515517 + s * (0.802853 + s * 0.010328)) / (1.0 + s * (1.432788 + s * (0.189269 + s * 0.001308))));
  for (int step = 0; step < 3; ++step) {
    const double density = std::exp(-0.5 * z * z) / std::sqrt(2.0 * std::numbers::pi);
    if (density == 0.0) break;
    const double newton = (0.5 * std::erfc(-z / std::numbers::sqrt2) - p) / density;
    z -= newton / (1.0 + 0.5 * z * newton);
  }
  return z;
}

}  // namespace sm::mixed
