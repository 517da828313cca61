#include "mixed/optimize.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <cstdint>
#include <cstring>
#include <limits>
#include <random>
#include <stdexcept>

#include "mixed/error.hpp"

namespace sm::mixed::test {
namespace {

using Vector = std::vector<double>;
using Point = std::span<const double>;
constexpr double kInfinity = std::numeric_limits<double>::infinity();

double largest(const Vector& v) {
  double most = 0.0;
  for (const double e : v) most = std::max(most, std::abs(e));
  return most;
}

// Rosenbrock (1960), in pairs.
Evaluation rosenbrock(Point x) {
  Evaluation e{.value = 0.0, .gradient = Vector(x.size(), 0.0)};
  for (std::size_t i = 0; i + 1 < x.size(); i += 2) {
    const double a = x[i + 1] - x[i] * x[i];
    const double b = 1.0 - x[i];
    e.value += 100.0 * a * a + b * b;
    e.gradient[i] = -400.0 * a * x[i] - 2.0 * b;
    e.gradient[i + 1] = 200.0 * a;
  }
  return e;
}

// The singular function of Powell (1962): its Hessian at the minimum has rank two.
Evaluation powell(Point x) {
  const double a = x[0] + 10.0 * x[1];
  const double b = x[2] - x[3];
  const double c = x[1] - 2.0 * x[2];
  const double d = x[0] - x[3];
  return {.value = a * a + 5.0 * b * b + std::pow(c, 4) + 10.0 * std::pow(d, 4),
          .gradient = {2.0 * a + 40.0 * std::pow(d, 3), 20.0 * a + 4.0 * std::pow(c, 3),
                       10.0 * b - 8.0 * std::pow(c, 3), -10.0 * b - 40.0 * std::pow(d, 3)}};
}

// x^4 / 4 - slope x^2 / 2 for each parameter: at 0 a maximum for a positive slope, else a minimum.
Objective even_quartics(const Vector& slopes) {
  return [slopes](Point x) {
    Evaluation e{.value = 0.0, .gradient = Vector(x.size())};
    for (std::size_t i = 0; i < x.size(); ++i) {
      e.value += std::pow(x[i], 4) / 4.0 - slopes[i] * x[i] * x[i] / 2.0;
      e.gradient[i] = std::pow(x[i], 3) - slopes[i] * x[i];
    }
    return e;
  };
}

// The profiled -2 log restricted likelihood of a balanced one-way layout, up to a constant, in theta = sd ratio: with
// g groups of m, sums of squares between and within.
struct OneWay {
  double groups, per_group, between, within;

  Evaluation operator()(Point x) const {
    const double f = groups * per_group - 1.0;
    const double k = 1.0 + per_group * x[0] * x[0];
    const double dk = 2.0 * per_group * x[0];
    const double s = within + between / k;
    return {.value = f * std::log(s / f) + (groups - 1.0) * std::log(k),
            .gradient = {f * (-between / (k * k)) / s * dk + (groups - 1.0) / k * dk}};
  }
  double mean_square_between() const { return between / (groups - 1.0); }
  double mean_square_within() const { return within / (groups * (per_group - 1.0)); }
};

TEST(Minimise, reaches_the_minima_of_classical_functions) {
  for (const std::size_t n : {std::size_t{2}, std::size_t{10}, std::size_t{20}}) {
    Vector start(n, 1.0);
    for (std::size_t i = 0; i < n; i += 2) start[i] = -1.2;
    const Minimum found = minimise(rosenbrock, start);
    EXPECT_EQ(found.convergence, Convergence::converged);
    EXPECT_EQ(found.optimizer, "trust-region Newton");
    for (const double v : found.x) EXPECT_NEAR(v, 1.0, 1e-6);
  }
  const Minimum singular = minimise(powell, {3.0, -1.0, 0.0, 1.0});
  EXPECT_EQ(singular.convergence, Convergence::converged);
  EXPECT_LT(singular.value, 1e-9);
}

TEST(Minimise, needs_few_evaluations_of_a_quadratic_function) {
  const Objective bowl = [](Point x) {
    Evaluation e{.value = 0.0, .gradient = Vector(x.size())};
    for (std::size_t i = 0; i < x.size(); ++i) {
      const double weight = std::pow(10.0, static_cast<double>(i));
      e.value += weight * (x[i] - 2.0) * (x[i] - 2.0);
      e.gradient[i] = 2.0 * weight * (x[i] - 2.0);
    }
    return e;
  };
  const Minimum found = minimise(bowl, Vector(5, 1.0));
  EXPECT_EQ(found.convergence, Convergence::converged);
  for (const double v : found.x) EXPECT_NEAR(v, 2.0, 1e-6);
  // A Hessian at the start and one at the end, and hardly more than the step between them.
  EXPECT_LE(found.evaluations, 1 + 5 + 3 + 5);
  for (std::size_t i = 0; i < 5; ++i) {
    EXPECT_NEAR(found.hessian[i * 6] / (2.0 * std::pow(10.0, static_cast<double>(i))), 1.0, 1e-6);
  }
}

// Powers of e in each direction and a square that ties them together; the Hessian, but for a part of each element.
struct Tied {
  double missing = 0.0;
  Vector at = {};

  Evaluation operator()(Point x) {
    at.assign(x.begin(), x.end());
    double sum = 0.0;
    for (const double v : x) sum += v;
    Evaluation e{.value = 0.5 * sum * sum, .gradient = Vector(x.size(), sum)};
    for (std::size_t i = 0; i < x.size(); ++i) {
      e.value += 1e4 * (std::exp(x[i]) - 2.0 * x[i]);
      e.gradient[i] += 1e4 * (std::exp(x[i]) - 2.0);
    }
    return e;
  }
  Vector hessian() const {
    const std::size_t n = at.size();
    Vector h(n * n, 1.0 - missing);
    for (std::size_t i = 0; i < n; ++i) h[i * n + i] += 1e4 * (1.0 - missing) * std::exp(at[i]);
    return h;
  }
};

TEST(Minimise, takes_steps_with_an_approximate_hessian_and_returns_the_true_one) {
  for (const double missing : {0.0, 0.05, -0.1}) {
    Tied tied{.missing = missing};
    const Objective objective = [&](Point x) { return tied(x); };
    const Minimum found = minimise(objective, Vector(4, 1.0), {.curvature = [&] { return tied.hessian(); }});
    EXPECT_EQ(found.convergence, Convergence::converged);
    EXPECT_LE(found.evaluations, 7 + 4 + 1) << missing;
    EXPECT_LT(largest(found.gradient), 1e-4) << missing;
    tied.missing = 0.0;
    tied.at = found.x;
    const Vector exact = tied.hessian();
    for (std::size_t i = 0; i < exact.size(); ++i) EXPECT_NEAR(found.hessian[i], exact[i], 2e-5 * exact[0]) << missing;
  }
}

TEST(Minimise, is_not_led_astray_by_a_hessian_that_is_wrong) {
  for (const double factor : {-1.0, 0.0, 1e-3, 100.0, kInfinity}) {
    Tied tied;
    const Objective objective = [&](Point x) { return tied(x); };
    const auto wrong = [&] {
      Vector h = tied.hessian();
      for (double& v : h) v *= factor;
      return h;
    };
    const Minimum found = minimise(objective, {3.0, -2.0, 0.0}, {.curvature = wrong});
    EXPECT_EQ(found.convergence, Convergence::converged) << factor;
    EXPECT_EQ(found.optimizer, "trust-region Newton") << factor;
    EXPECT_LT(largest(found.gradient), 1e-3) << factor;
  }
}

TEST(Minimise, finds_a_variance_in_closed_form) {
  // Davies and Goldsmith (1972), table 6.1: six batches of five.
  const OneWay dyestuff{6.0, 5.0, 56357.5, 58830.0};
  const double expected =
      std::sqrt((dyestuff.mean_square_between() - dyestuff.mean_square_within()) / 5.0 / dyestuff.mean_square_within());
  for (const double start : {0.01, 0.1, 1.0, 5.0, 100.0}) {
    const Minimum found = minimise(dyestuff, {start});
    EXPECT_EQ(found.convergence, Convergence::converged);
    EXPECT_NEAR(std::abs(found.x[0]), expected, 1e-7) << "from " << start;
    EXPECT_LT(found.evaluations, 60) << "from " << start;
  }
}

TEST(Minimise, runs_into_a_boundary_at_zero_without_losing_speed) {
  const OneWay boundary{6.0, 5.0, 30.0, 400.0};
  ASSERT_LT(boundary.mean_square_between(), boundary.mean_square_within());
  for (const double start : {0.05, 1.0, 10.0}) {
    const Minimum found = minimise(boundary, {start});
    EXPECT_EQ(found.convergence, Convergence::converged);
    EXPECT_NEAR(found.x[0], 0.0, 1e-6);
    EXPECT_LT(found.evaluations, 50) << "from " << start;
  }
}

TEST(Minimise, stays_at_a_zero_that_is_a_minimum_and_leaves_one_that_is_not) {
  for (const Vector& slopes : {Vector{1.0, -1.0}, {4.0, 0.25}, {-2.0, -3.0}, {1e-2, 1.0}}) {
    for (const Vector& start : {Vector{0.0, 0.0}, {1.0, 0.0}, {0.0, 1.0}, {3.0, -2.0}}) {
      const Minimum found = minimise(even_quartics(slopes), start);
      EXPECT_EQ(found.convergence, Convergence::converged);
      for (std::size_t i = 0; i < 2; ++i) {
        EXPECT_NEAR(std::abs(found.x[i]), slopes[i] > 0.0 ? std::sqrt(slopes[i]) : 0.0, 1e-5)
            << slopes[0] << ' ' << slopes[1] << " from " << start[0] << ' ' << start[1];
      }
    }
  }
}

TEST(Minimise, leaves_a_maximum_without_curvature_but_not_such_a_minimum) {
  const Minimum flat = minimise(even_quartics({0.0}), {0.0});
  EXPECT_EQ(flat.convergence, Convergence::converged);
  EXPECT_NEAR(flat.x[0], 0.0, 1e-9);
  const Objective top = [](Point x) {
    return Evaluation{.value = std::pow(x[0], 6) / 6.0 - std::pow(x[0], 4) / 4.0,
                      .gradient = {std::pow(x[0], 5) - std::pow(x[0], 3)}};
  };
  const Minimum left = minimise(top, {0.0});
  EXPECT_EQ(left.convergence, Convergence::converged);
  EXPECT_NEAR(std::abs(left.x[0]), 1.0, 1e-6);
}

// A covariance factor (a; b d) whose first variance is zero at the optimum: what is left of b and d is their circle.
TEST(Minimise, converges_on_a_ridge) {
  const Objective ridge = [](Point x) {
    const double variance = x[1] * x[1] + x[2] * x[2];
    const double miss = variance - 2.0;
    return Evaluation{.value = 50.0 * x[0] * x[0] + x[0] * x[0] * x[1] * x[1] + 10.0 * miss * miss,
                      .gradient = {100.0 * x[0] + 2.0 * x[0] * x[1] * x[1],
                                   2.0 * x[0] * x[0] * x[1] + 40.0 * miss * x[1], 40.0 * miss * x[2]}};
  };
  for (const Vector& start : {Vector{1.0, 0.0, 1.0}, {0.3, -2.0, 0.1}, {1.0, 1.0, 1.0}}) {
    const Minimum found = minimise(ridge, start);
    EXPECT_EQ(found.convergence, Convergence::converged);
    EXPECT_EQ(found.optimizer, "trust-region Newton");
    EXPECT_NEAR(found.x[0], 0.0, 1e-6);
    EXPECT_NEAR(found.x[1] * found.x[1] + found.x[2] * found.x[2], 2.0, 1e-6);
    EXPECT_LT(found.evaluations, 100);
  }
}

TEST(Minimise, turns_back_where_the_function_is_infinite) {
  // Its minimum is at 1, and a step of Newton's from 10 leads far beyond 0.
  const Objective barrier = [](Point x) {
    if (x[0] <= 0.0) return Evaluation{.value = kInfinity, .gradient = {}};
    return Evaluation{.value = x[0] - std::log(x[0]), .gradient = {1.0 - 1.0 / x[0]}};
  };
  for (const double start : {1e-3, 0.5, 10.0, 1000.0}) {
    const Minimum found = minimise(barrier, {start});
    EXPECT_EQ(found.convergence, Convergence::converged) << "from " << start;
    EXPECT_NEAR(found.x[0], 1.0, 1e-6) << "from " << start;
  }
}

// What a value of large size loses to rounding, the same for the same place.
double rounding(Point x, double size) {
  std::uint64_t bits = 0x9e3779b97f4a7c15u;
  for (const double v : x) {
    std::uint64_t word = 0;
    std::memcpy(&word, &v, sizeof word);
    bits = (bits ^ word) * 0xbf58476d1ce4e5b9u;
    bits ^= bits >> 29;
  }
  return size * (static_cast<double>(bits >> 11) / 4503599627370496.0 - 1.0);
}

TEST(Minimise, goes_by_the_gradient_where_values_are_rounding) {
  for (const double size : {1e-9, 1e-6, 1e-4}) {
    const Objective noisy = [size](Point x) {
      Evaluation e = rosenbrock(x);
      e.value += 65000.0 + rounding(x, size);
      return e;
    };
    const Minimum found = minimise(noisy, {-1.2, 1.0});
    EXPECT_EQ(found.convergence, Convergence::converged) << size;
    EXPECT_EQ(found.optimizer, "trust-region Newton") << size;
    for (const double v : found.x) EXPECT_NEAR(v, 1.0, 1e-5) << size;
  }
}

TEST(Minimise, does_not_call_converged_what_has_no_minimum) {
  const Objective falling = [](Point x) {
    return Evaluation{.value = std::exp(-x[0]), .gradient = {-std::exp(-x[0])}};
  };
  const Objective kink = [](Point x) {
    return Evaluation{.value = std::abs(x[0] - 0.3), .gradient = {x[0] < 0.3 ? -1.0 : 1.0}};
  };
  const Objective cliff = [](Point x) { return Evaluation{.value = -x[0] * x[0], .gradient = {-2.0 * x[0]}}; };
  EXPECT_EQ(minimise(cliff, {1.0}).convergence, Convergence::not_converged);
  const Minimum edge = minimise(kink, {1.0});
  EXPECT_EQ(edge.convergence, Convergence::not_converged);
  EXPECT_EQ(edge.optimizer.substr(0, 5), "NLopt");
  EXPECT_NEAR(edge.x[0], 0.3, 1e-3);
  const Minimum slope = minimise(falling, {1.0}, {.max_iterations = 3});
  EXPECT_TRUE(slope.convergence == Convergence::not_converged || slope.value < 1e-11) << slope.x[0];
}

TEST(Minimise, hands_over_to_value_searches_and_lets_the_gradient_decide) {
  const Minimum found = minimise(rosenbrock, {-1.2, 1.0}, {.max_iterations = 2});
  EXPECT_EQ(found.convergence, Convergence::converged);
  EXPECT_EQ(found.optimizer.substr(0, 12), "NLopt BOBYQA");
  EXPECT_LT(largest(found.gradient), 1e-4);
  const Minimum values_only = minimise(rosenbrock, {-1.2, 1.0}, {.derivative_free = true});
  EXPECT_EQ(values_only.convergence, Convergence::converged);
  EXPECT_EQ(values_only.optimizer.substr(0, 5), "NLopt");
  for (const double v : values_only.x) EXPECT_NEAR(v, 1.0, 1e-3);
}

TEST(Minimise, stops_when_asked_to_with_the_best_point_so_far) {
  for (const bool derivative_free : {false, true}) {
    int calls = 0;
    const MinimiseOptions options{.progress = [&](const Iteration&) { return ++calls < 4; },
                                  .derivative_free = derivative_free};
    const Minimum found = minimise(rosenbrock, {-1.2, 1.0}, options);
    EXPECT_EQ(found.convergence, Convergence::stopped);
    EXPECT_EQ(calls, 4);
    EXPECT_EQ(found.iterations.size(), 4u);
    EXPECT_LT(found.value, rosenbrock(Vector{-1.2, 1.0}).value);
    EXPECT_DOUBLE_EQ(found.value, rosenbrock(found.x).value);
  }
}

TEST(Minimise, notes_falling_values_and_scores) {
  const Minimum found = minimise(rosenbrock, {-1.2, 1.0});
  ASSERT_GT(found.iterations.size(), 3u);
  EXPECT_DOUBLE_EQ(found.iterations.front().criterion, rosenbrock(Vector{-1.2, 1.0}).value);
  for (std::size_t k = 1; k < found.iterations.size(); ++k) {
    EXPECT_LE(found.iterations[k].criterion, found.iterations[k - 1].criterion + 1e-12);
    EXPECT_GT(found.iterations[k].step, 0.0);
  }
  EXPECT_LT(found.iterations.back().score, 1e-6);
}

TEST(Minimise, lets_exceptions_of_the_function_through) {
  for (const bool derivative_free : {false, true}) {
    int calls = 0;
    const Objective failing = [&](Point x) {
      if (++calls == 7) throw std::runtime_error("no more");
      return rosenbrock(x);
    };
    EXPECT_THROW(minimise(failing, {-1.2, 1.0}, {.derivative_free = derivative_free}), std::runtime_error);
  }
  const Objective nowhere = [](Point) { return Evaluation{.value = kInfinity, .gradient = {0.0}}; };
  EXPECT_THROW(minimise(nowhere, {1.0}), ModelError);
}

// Even polynomials in random coordinates: whatever is called converged is a minimum among its neighbours.
TEST(Minimise, ends_in_minima_of_random_symmetric_functions) {
  std::mt19937_64 random(20240517);
  std::normal_distribution<double> normal;
  int converged = 0;
  for (int trial = 0; trial < 200; ++trial) {
    const std::size_t n = 1 + static_cast<std::size_t>(trial) % 6;
    Vector q(n * n);
    for (double& v : q) v = normal(random);
    // f = sum of squares of (x_i^2 combinations): |Q s - 1|^2 / 2 with s_i = x_i^2, and a bowl far out.
    const Objective f = [&](Point x) {
      Evaluation e{.value = 0.0, .gradient = Vector(n, 0.0)};
      for (std::size_t i = 0; i < n; ++i) {
        double r = -1.0;
        for (std::size_t j = 0; j < n; ++j) r += q[i * n + j] * x[j] * x[j];
        e.value += 0.5 * r * r + 0.005 * x[i] * x[i];
        for (std::size_t j = 0; j < n; ++j) e.gradient[j] += r * q[i * n + j] * 2.0 * x[j];
        e.gradient[i] += 0.01 * x[i];
      }
      return e;
    };
    const Minimum found = minimise(f, Vector(n, 1.0));
    if (found.convergence == Convergence::converged) ++converged;
    for (int k = 0; k < 50; ++k) {
      Vector near = found.x;
      for (double& v : near) v += 1e-3 * normal(random);
      EXPECT_GE(f(near).value, found.value - 1e-10) << "trial " << trial;
    }
    EXPECT_LT(found.evaluations, 300) << "trial " << trial;
  }
  EXPECT_EQ(converged, 200);
}

}  // namespace
}  // namespace sm::mixed::test
