// Models that the data do not determine, in part or at all: no number then, and the cause in words.
#include <fmt/core.h>
#include <gtest/gtest.h>

#include <cmath>

#include "loaded_module.hpp"
#include "mixed/estimate.hpp"
#include "support.hpp"

namespace sm::mixed::test {
namespace {

// Forty observations of a line, in eight groups.
std::string lines(double (*response)(int row, int x, int group)) {
  std::string table = "y,x,g,f\n";
  for (int i = 0; i < 40; ++i) {
    table += fmt::format("{:.17g}", response(i, i % 5, i % 8)) + "," + std::to_string(i % 5) + ",g" +
             std::to_string(i % 8) + ",f" + std::to_string(i % 4) + "\n";
  }
  return table;
}

Fit fitted(const std::string& table, const std::string& formula, const FitOptions& options = {}) {
  LoadedModule loaded;
  return fit(model_of(table, formula), loaded.module(), options);
}

bool says(const Fit& fit, const std::string& part) {
  for (const std::string& message : fit.messages) {
    if (message.find(part) != std::string::npos) return true;
  }
  return false;
}

TEST(NoAnswer, to_a_response_that_the_fixed_effects_explain_exactly) {
  const std::string exact = lines([](int, int x, int) { return 0.3 + 0.1 * x; });
  for (const char* formula : {"y ~ x", "y ~ x + (1 | g)"}) {
    for (const bool reml : {true, false}) {
      const Fault fault = fault_of([&] { fitted(exact, formula, {.reml = reml}); });
      EXPECT_EQ(fault.variable, "y");
      EXPECT_NE(fault.what.find("the fixed effects explain the response exactly"), std::string::npos) << fault.what;
      EXPECT_FALSE(fault.advice.empty());
    }
  }
  // A small residual is none of rounding: a response about 1e6 with differences of 1e-5 from the line.
  const Fit small = fitted(lines([](int row, int x, int) { return 1e6 + x + 1e-5 * (row * row % 7); }), "y ~ x");
  EXPECT_EQ(small.convergence, Convergence::converged);
  EXPECT_NEAR(std::sqrt(small.varcomp.back().vcov), 2e-5, 1e-5);
}

// Rounding decides how it is noticed: by a boundary, by an information of nothing, or by a standard error without bounds.
TEST(NoAnswer, to_a_variance_between_groups_that_finer_fixed_effects_explain) {
  for (int seed = 1; seed <= 40; ++seed) {
    std::string table = "y,g,f\n";
    for (int i = 0; i < 96; ++i) {
      const double noise = i * i * seed % 101 / 25.0;
      table += fmt::format("{:.4f},g{},f{}\n", 10.0 * (i % 4) + i % 12 + noise, i % 12, i % 4);
    }
    const Fit nested = fitted(table, "y ~ g + (1 | f)");
    EXPECT_TRUE(says(nested, "do not determine the variance of 'f'") || says(nested, "the likelihood is flat") ||
                says(nested, "its variance is zero"))
        << seed;
    EXPECT_FALSE(says(fitted(table, "y ~ f + (1 | g)"), "do not determine")) << seed;
  }
}

TEST(NoAnswer, to_a_residual_variance_that_random_effects_leave_nothing_for) {
  const Fit exact = fitted(lines([](int, int x, int g) { return 3.0 + 2.0 * x + g * g % 7; }), "y ~ x + (1 | g)");
  EXPECT_NE(exact.convergence, Convergence::converged);
  EXPECT_TRUE(says(exact, "the residual variance is practically zero"));
  EXPECT_EQ(exact.obstacle, exact.messages.back());
  for (const VarianceComponent& component : exact.varcomp) EXPECT_FALSE(component.se_observed);
  const Fit usual =
      fitted(lines([](int row, int x, int g) { return 2.0 * x + g * g % 7 + row * row % 3; }), "y ~ x + (1 | g)");
  EXPECT_EQ(usual.convergence, Convergence::converged);
  EXPECT_EQ(usual.obstacle, "");
}

// The slopes of f take up what the slopes of g could vary by: the criterion does not depend on the variance of these.
TEST(NoAnswer, for_degrees_of_freedom_where_the_data_hardly_determine_a_variance) {
  const std::string table =
      "y,f,g,x\n1.0953,f0,g1,0\n1.1138,f1,g1,1\n-0.2013,f2,g2,2\n0.1449,f0,g0,3\n-1.9124,f1,g1,4\n-0.9462,f2,g2,0\n"
      "0.0881,f0,g0,1\n-1.5518,f1,g1,2\n-0.2215,f2,g2,3\n-1.4581,f0,g0,4\n0.2696,f1,g1,0\n0.2166,f2,g2,1\n";
  LoadedModule loaded;
  const Model model = model_of(table, "y ~ f*x + (x || g)");
  ASSERT_EQ(model.fixed.names[4], "ff1:x");
  FitOptions options;
  options.contrasts.push_back({.name = "slope", .l = {0, 0, 0, 1, 1, 0}});
  const Fit flat = fit(model, loaded.module(), options);
  for (const FixedEffect& effect : flat.fixef) {
    EXPECT_GE(effect.df.value_or(1.0), 0.005) << effect.name;
  }
  EXPECT_FALSE(flat.fixef[4].df);
  EXPECT_FALSE(flat.contrasts[0].df);
  ASSERT_TRUE(says(flat, "degrees of freedom are not available (—)"));
  EXPECT_TRUE(says(flat, "the variance of 'g' (x)"));
}

}  // namespace
}  // namespace sm::mixed::test
