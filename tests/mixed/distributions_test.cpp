#include "mixed/distributions.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <limits>
#include <numbers>

namespace sm::mixed::test {
namespace {

constexpr double kInfinity = std::numeric_limits<double>::infinity();

// Relative, so that small tails count as much as large ones.
void expect_near_relative(double got, double want, double tolerance) {
  EXPECT_LE(std::fabs(got - want), tolerance * std::fabs(want)) << "got " << got << ", want " << want;
}

// The tail by Simpson's rule after t = sinh(s), which makes the integrand decay fast enough to cut it off.
double tail_by_quadrature(double t, double df) {
  const double constant =
      std::exp(std::lgamma(0.5 * (df + 1.0)) - std::lgamma(0.5 * df)) / std::sqrt(df * std::numbers::pi);
  const double from = std::asinh(t);
  const double to = from + 3.0 + 30.0 / df;
  constexpr int kSteps = 100'000;
  const double h = (to - from) / kSteps;
  double sum = 0.0;
  for (int i = 0; i <= kSteps; ++i) {
    const double s = from + h * i;
    const double u = std::sinh(s);
    const double f = std::exp(-0.5 * (df + 1.0) * std::log1p(u * u / df)) * std::cosh(s);
    sum += (i == 0 || i == kSteps ? 1.0 : i % 2 == 1 ? 4.0 : 2.0) * f;
  }
  return 2.0 * constant * sum * h / 3.0;
}

TEST(StudentT, has_the_closed_forms_of_one_to_four_degrees_of_freedom) {
  for (const double t : {1e-8, 0.01, 0.5, 1.0, 2.0, 4.3, 30.0, 1e4, 1e8}) {
    expect_near_relative(student_two_sided(t, 1.0), std::atan2(1.0, t) * 2.0 / std::numbers::pi, 1e-12);
    const double r = std::sqrt(2.0 + t * t);  // 1 - t / r without the difference
    expect_near_relative(student_two_sided(t, 2.0), 2.0 / (r * (r + t)), 1e-12);
  }
  for (const double t : {0.25, 1.0, 2.5}) {
    const double a = std::atan(t / std::sqrt(3.0));
    expect_near_relative(student_two_sided(t, 3.0), 1.0 - (a + std::sin(a) * std::cos(a)) * 2.0 / std::numbers::pi,
                         1e-12);
    const double b = std::atan(t / 2.0);
    expect_near_relative(student_two_sided(t, 4.0), 1.0 - std::sin(b) * (1.0 + 0.5 * std::pow(std::cos(b), 2)), 1e-12);
  }
}

TEST(StudentT, has_the_percentage_points_of_the_printed_tables) {
  expect_near_relative(student_two_sided(2.262157, 9.0), 0.05, 1e-6);
  expect_near_relative(student_two_sided(2.750, 30.0), 0.01, 1e-3);
  expect_near_relative(student_two_sided(12.706205, 1.0), 0.05, 1e-7);
  expect_near_relative(student_two_sided(1.959963984540054, kInfinity), 0.05, 1e-14);
}

TEST(StudentT, agrees_with_quadrature_at_broken_degrees_of_freedom) {
  for (const double df : {0.5, 2.75, 17.93, 49.9, 50.1, 2761.81}) {
    for (const double t : {0.1, 1.0, 3.0, 6.5}) {
      expect_near_relative(student_two_sided(t, df), tail_by_quadrature(t, df), 1e-10);
    }
  }
}

TEST(StudentT, becomes_the_normal_distribution) {
  for (const double t : {0.1, 1.0, 5.0}) {
    const double normal = std::erfc(t / std::numbers::sqrt2);
    expect_near_relative(student_two_sided(t, 1e9), normal, 2e-7);
    expect_near_relative(student_two_sided(t, 1e13), normal, 1e-12);
  }
}

TEST(StudentT, is_symmetric_and_judges_odd_arguments) {
  EXPECT_EQ(student_two_sided(-1.5, 7.0), student_two_sided(1.5, 7.0));
  EXPECT_NEAR(student_two_sided(0.0, 7.0), 1.0, 1e-15);
  EXPECT_EQ(student_two_sided(kInfinity, 7.0), 0.0);
  EXPECT_EQ(student_two_sided(1e200, 7.0), 0.0);
  EXPECT_TRUE(std::isnan(student_two_sided(1.0, 0.0)));
  EXPECT_TRUE(std::isnan(student_two_sided(1.0, std::nan(""))));
  EXPECT_TRUE(std::isnan(student_two_sided(std::nan(""), 3.0)));
}

TEST(NormalQuantile, is_the_inverse_of_the_distribution) {
  EXPECT_NEAR(normal_quantile(0.975), 1.959963984540054, 1e-14);
  EXPECT_NEAR(normal_quantile(0.995), 2.5758293035489004, 1e-13);
  EXPECT_NEAR(normal_quantile(0.5), 0.0, 1e-16);
  for (const double p : {1e-300, 1e-20, 1e-6, 0.01, 0.3, 0.49}) {
    expect_near_relative(0.5 * std::erfc(-normal_quantile(p) / std::numbers::sqrt2), p, 1e-11);
  }
  EXPECT_EQ(normal_quantile(0.75), -normal_quantile(0.25));
}

TEST(NormalQuantile, judges_odd_arguments) {
  EXPECT_EQ(normal_quantile(0.0), -kInfinity);
  EXPECT_EQ(normal_quantile(1.0), kInfinity);
  EXPECT_TRUE(std::isnan(normal_quantile(-0.1)));
  EXPECT_TRUE(std::isnan(normal_quantile(std::nan(""))));
}

}  // namespace
}  // namespace sm::mixed::test
