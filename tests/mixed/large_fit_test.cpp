// What is done for large models only.
#include <gtest/gtest.h>

#include <cmath>

#include "dense_oracle.hpp"
#include "loaded_module.hpp"
#include "mixed/estimate.hpp"
#include "mixed/likelihood.hpp"
#include "random_models.hpp"

namespace sm::mixed::test {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

TEST(LargeFit, ends_at_one_place_wherever_it_begins) {
  LoadedModule loaded;
  const ModelShape shape{.rows = 3000, .terms = {{.coefs = 2, .levels = 500, .sd = 0.3}, {.levels = 40, .sd = 3.0}}};
  const Model model = random_model(shape, 1);
  const Fit expected = fit(model, loaded.module());
  ASSERT_EQ(expected.convergence, Convergence::converged);
  for (const double size : {0.02, 30.0}) {
    FitOptions away;
    away.start = {size, 0.0, size, size};
    const Fit fitted = fit(model, loaded.module(), away);
    ASSERT_EQ(fitted.convergence, Convergence::converged);
    EXPECT_NEAR(fitted.criterion, expected.criterion, 1e-9 * std::abs(expected.criterion));
    for (std::size_t i = 0; i < expected.varcomp.size(); ++i) {
      EXPECT_NEAR(fitted.varcomp[i].vcov, expected.varcomp[i].vcov, 1e-5 * std::abs(expected.varcomp[i].vcov));
    }
  }
}

// Of crossed factors sums of squares between levels tell the variances well.
TEST(LargeFit, begins_near_the_optimum) {
  LoadedModule loaded;
  const ModelShape shape{.rows = 4000, .terms = {{.levels = 300, .sd = 0.3}, {.levels = 40, .sd = 3.0}}};
  const Model model = random_model(shape, 1);
  const Fit fitted = fit(model, loaded.module());
  FitOptions plain;
  plain.start = {1.0, 1.0};
  const Fit from_one = fit(model, loaded.module(), plain);
  ASSERT_EQ(fitted.convergence, Convergence::converged);
  ASSERT_EQ(from_one.convergence, Convergence::converged);
  EXPECT_NEAR(fitted.criterion, from_one.criterion, 1e-9 * std::abs(from_one.criterion));
  EXPECT_LT(fitted.iterations.front().criterion - fitted.criterion,
            0.1 * (from_one.iterations.front().criterion - fitted.criterion));
}

// With the first factor eliminated the second is full, and nothing else has filled in.
TEST(LargeFit, of_crossed_factors_has_no_more_fill_than_the_square_of_the_smaller_one) {
  LoadedModule loaded;
  Model model = random_model({.rows = 1500, .terms = {{.levels = 60}, {.levels = 45}}}, 2);
  // Half of the second factor's levels have few rows: by degree they would come among the levels of the first.
  for (std::int64_t i = 0; i < model.rows(); ++i) {
    std::int64_t& level = model.random[1].level[at(i)];
    if (level % 2 == 0 && i % 2 == 0 && level < 44) level += 1;
  }
  const ScaledDesign design(model);
  Likelihood likelihood(loaded.module(), design, true);
  const EquationFacts facts = likelihood.equations().facts();
  const std::int64_t others = facts.order - 60;
  EXPECT_LT(facts.factor_entries, facts.entries + others * (others + 1) / 2);
  const CriterionParts parts = likelihood.evaluate({{0.8}, {1.3}}, false);
  ASSERT_TRUE(parts.defined);
  const double variance = parts.s2 / likelihood.degrees();
  const auto component = [&](std::size_t t, double factor) {
    return static_cast<Real>(variance * std::pow(factor * design.terms()[t].basis[0], 2));
  };
  VectorL parameters(3);
  parameters << component(0, 0.8), component(1, 1.3), static_cast<Real>(variance);
  const auto expected = static_cast<double>(DenseOracle(model).criterion(parameters, true));
  EXPECT_NEAR(likelihood.profiled(parts), expected, 1e-9 * std::abs(expected));
}

}  // namespace
}  // namespace sm::mixed::test
