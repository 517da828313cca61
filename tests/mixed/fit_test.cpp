#include <gtest/gtest.h>

#include <cmath>

#include "dense_oracle.hpp"
#include "loaded_module.hpp"
#include "mixed/error.hpp"
#include "mixed/estimate.hpp"
#include "random_models.hpp"

namespace sm::mixed::test {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

struct Case {
  std::string name;
  ModelShape shape;
  std::uint64_t seeds = 2;
};

void PrintTo(const Case& c, std::ostream* out) { *out << c.name; }

std::vector<Case> cases() {
  const TermShape one{.levels = 8, .sd = 2.0};
  const TermShape slope{.coefs = 2, .levels = 12, .sd = 1.5};
  return {
      {"one_term", {.rows = 60, .terms = {one}}},
      {"weighted", {.rows = 60, .weighted = true, .terms = {one}}},
      {"crossed_terms", {.rows = 90, .terms = {{.levels = 14}, {.levels = 8, .sd = 0.8}}}},
      {"correlated_slopes", {.rows = 120, .terms = {slope}}},
      {"slopes_and_another_term", {.rows = 120, .factor = 3, .weighted = true, .terms = {slope, one}}},
      {"aliased_columns", {.rows = 70, .numeric = 2, .aliased = 2, .factor = 3, .terms = {one}}},
      {"no_fixed_effects", {.rows = 60, .numeric = 0, .intercept = false, .terms = {one}}},
      {"a_chain", {.rows = 70, .terms = {{.levels = 25, .field = Field::chain, .sd = 2.0}}}},
      {"a_ring", {.rows = 90, .terms = {{.levels = 20, .field = Field::ring, .sd = 2.0}}}},
      {"a_ring_without_intercept",
       {.rows = 90, .intercept = false, .terms = {{.levels = 20, .field = Field::ring, .sd = 2.0}}}},
      {"two_rings",
       {.rows = 90, .terms = {{.levels = 9, .field = Field::ring}, {.levels = 20, .field = Field::ring, .sd = 2.0}}}},
      {"years_and_their_squares", {.rows = 80, .offset = 1990.0, .terms = {one}}},
      {"a_distant_response", {.rows = 60, .response_offset = 1e7, .terms = {one}}},
      {"small_variance", {.rows = 150, .terms = {{.levels = 10, .sd = 0.3}}}, 2},
      {"large_variance", {.rows = 60, .noise = 0.01, .terms = {one}}},
      {"a_small_variance_beside_a_large_one",
       {.rows = 150, .terms = {{.levels = 8, .sd = 200.0}, {.levels = 14, .sd = 0.4}}}},
      {"a_small_response", {.rows = 60, .noise = 1e-7, .terms = {{.levels = 8, .sd = 2e-7}}}},
      {"two_levels", {.rows = 9, .terms = {{.levels = 2, .sd = 3.0}}}},
  };
}

VectorL components(const Fit& fit) {
  VectorL all(static_cast<Eigen::Index>(fit.varcomp.size()));
  for (std::size_t i = 0; i < fit.varcomp.size(); ++i) all(static_cast<Eigen::Index>(i)) = fit.varcomp[i].vcov;
  return all;
}

void expect_relative(double got, Real want, double tolerance, const std::string& what) {
  EXPECT_LE(std::abs(got - static_cast<double>(want)), tolerance * std::abs(static_cast<double>(want)))
      << what << ": " << got << ", expected " << static_cast<double>(want);
}

// No component can move, one at a time, so that the likelihood grows: first by a slope that is flat against the
// curvature, on the boundary by a slope that does not lead inside.
void expect_minimum(const DenseOracle& oracle, const Fit& fit) {
  const VectorL here = components(fit);
  const DenseOracle::Answer answer = oracle.answer(here, fit.reml);
  for (std::size_t i = 0; i < fit.varcomp.size(); ++i) {
    const auto e = static_cast<Eigen::Index>(i);
    const Real slope = oracle.slope(answer, i, fit.reml);
    if (fit.varcomp[i].vcov == 0.0) {
      EXPECT_GE(slope, -1e-6L) << "component " << i << " wants to leave the boundary";
    } else {
      EXPECT_LE(std::abs(slope), 1e-7L * std::sqrt(answer.expected(e, e)))
          << "component " << i << " of " << fit.varcomp[i].group;
    }
  }
}

void expect_variances(const Fit& fit, const DenseOracle::Answer& answer) {
  const auto count = static_cast<Eigen::Index>(fit.free.size());
  MatrixL observed(count, count);
  MatrixL average(count, count);
  for (Eigen::Index i = 0; i < count; ++i) {
    for (Eigen::Index j = 0; j < count; ++j) {
      const auto a = static_cast<Eigen::Index>(fit.free[std::size_t(i)]);
      const auto b = static_cast<Eigen::Index>(fit.free[std::size_t(j)]);
      observed(i, j) = answer.observed(a, b);
      average(i, j) = answer.average(a, b);
    }
  }
  const MatrixL inverse = inverse_of(observed);
  const MatrixL average_inverse = inverse_of(average);
  for (Eigen::Index i = 0; i < count; ++i) {
    const VarianceComponent& component = fit.varcomp[fit.free[std::size_t(i)]];
    ASSERT_TRUE(component.se_observed && component.se_average);
    expect_relative(*component.se_observed, std::sqrt(inverse(i, i)), 1e-6, "observed");
    expect_relative(*component.se_average, std::sqrt(average_inverse(i, i)), 1e-7, "average");
    for (Eigen::Index j = 0; j < count; ++j) {
      const double scale = static_cast<double>(std::sqrt(observed(i, i) * observed(j, j)));
      EXPECT_NEAR(fit.information_observed[std::size_t(j * count + i)], static_cast<double>(observed(i, j)),
                  1e-6 * scale);
      EXPECT_NEAR(fit.information_average[std::size_t(j * count + i)], static_cast<double>(average(i, j)),
                  1e-7 * scale);
    }
  }
}

void expect_effects(const Model& model, const Fit& fit, const DenseOracle& oracle, const DenseOracle::Answer& answer) {
  for (std::size_t j = 0; j < model.fixed.kept.size(); ++j) {
    const auto e = static_cast<Eigen::Index>(j);
    const FixedEffect& effect = fit.fixef[at(model.fixed.kept[j])];
    const Real se = std::sqrt(answer.beta_covariance(e, e));
    expect_relative(effect.se, se, 1e-8, effect.name);
    EXPECT_LE(std::abs(effect.estimate - answer.beta(e)), 1e-7L * se) << effect.name;
    VectorL unit = VectorL::Zero(answer.beta.size());
    unit(e) = 1.0L;
    ASSERT_TRUE(effect.df);
    expect_relative(*effect.df, oracle.satterthwaite(answer, unit, fit.free), 1e-5, effect.name + " df");
    for (std::size_t i = 0; i < model.fixed.kept.size(); ++i) {
      const auto f = static_cast<Eigen::Index>(i);
      const Real scale = se * std::sqrt(answer.beta_covariance(f, f));
      EXPECT_LE(std::abs(fit.vcov_fixef[j * model.fixed.kept.size() + i] - answer.beta_covariance(f, e)),
                1e-8L * scale);
    }
  }
  std::size_t place = 0;
  for (std::size_t t = 0; t < model.random.size(); ++t) {
    const auto k = at(model.random[t].coef_count());
    for (std::size_t c = 0; c < k; ++c, ++place) {
      const RandomEffects& effects = fit.ranef[place];
      const Real scale = answer.random[t].cwiseAbs().maxCoeff();
      for (std::size_t l = 0; l < effects.levels.size(); ++l) {
        const auto e = static_cast<Eigen::Index>(l * k + c);
        EXPECT_LE(std::abs(effects.estimate[l] - answer.random[t](e)), 1e-7L * scale);
        const Real pev = std::sqrt(std::max(0.0L, answer.random_covariance[t](e, e)));
        const Real conditional = std::sqrt(std::max(0.0L, answer.conditional[t](e, e)));
        EXPECT_LE(std::abs(effects.pev_sd[l] - pev), 1e-7L * pev) << effects.group << " level " << l;
        EXPECT_LE(std::abs(effects.cond_sd[l] - conditional), 1e-7L * conditional) << effects.group << " level " << l;
      }
    }
  }
}

class Fitting : public testing::TestWithParam<Case> {};

TEST_P(Fitting, agrees_with_dense_matrices) {
  LoadedModule loaded;
  for (std::uint64_t seed = 1; seed <= GetParam().seeds; ++seed) {
    const Model model = random_model(GetParam().shape, seed);
    const DenseOracle oracle(model);
    for (const bool reml : {true, false}) {
      SCOPED_TRACE("seed " + std::to_string(seed) + (reml ? " REML" : " ML"));
      const Fit fitted = fit(model, loaded.module(), {.reml = reml});
      ASSERT_EQ(fitted.convergence, Convergence::converged);
      EXPECT_EQ(fitted.optimizer, "trust-region Newton");
      const VectorL here = components(fitted);
      EXPECT_NEAR(fitted.criterion, static_cast<double>(oracle.criterion(here, reml)), 1e-8);
      expect_minimum(oracle, fitted);
      const DenseOracle::Answer answer = oracle.answer(here, reml);
      expect_variances(fitted, answer);
      expect_effects(model, fitted, oracle, answer);
      EXPECT_EQ(fitted.singular, fitted.free.size() < fitted.varcomp.size());
      EXPECT_EQ(fitted.messages.empty(), !fitted.singular);
      EXPECT_NEAR(fitted.ypy, static_cast<double>(model.rows() - (reml ? model.fixed.rank() : 0)), 1e-6);
    }
  }
}

TEST_P(Fitting, ends_at_the_same_place_from_any_start) {
  LoadedModule loaded;
  const Model model = random_model(GetParam().shape, 5);
  const Fit first = fit(model, loaded.module());
  for (const double size : {0.02, 0.5, 30.0}) {
    FitOptions options;
    for (const RandomTerm& term : model.random) {
      for (std::int64_t b = 0; b < term.coef_count(); ++b) {
        for (std::int64_t a = b; a < term.coef_count(); ++a) options.start.push_back(a == b ? size : 0.1 * size);
      }
    }
    const Fit other = fit(model, loaded.module(), options);
    ASSERT_EQ(other.convergence, Convergence::converged) << size;
    EXPECT_NEAR(other.criterion, first.criterion, 1e-8) << size;
    for (std::size_t i = 0; i < first.varcomp.size(); ++i) {
      EXPECT_NEAR(other.varcomp[i].vcov, first.varcomp[i].vcov, 1e-6 * std::abs(first.varcomp[i].vcov)) << size;
    }
  }
}

TEST(FittingUnits, changes_with_the_units_of_a_slope_only_what_has_them) {
  LoadedModule loaded;
  Model model = random_model({.rows = 120, .terms = {{.coefs = 2, .levels = 12, .sd = 1.5}}}, 1);
  const Fit first = fit(model, loaded.module());
  for (std::size_t i = 1; i < model.random[0].z.size(); i += 2) model.random[0].z[i] *= 1e-6;
  const Fit other = fit(model, loaded.module());
  EXPECT_FALSE(first.singular);
  EXPECT_FALSE(other.singular);
  EXPECT_TRUE(other.messages.empty()) << other.messages.front();
  EXPECT_NEAR(other.criterion, first.criterion, 1e-8);
  EXPECT_NEAR(other.varcomp[2].vcov, 1e12 * first.varcomp[2].vcov, 1e6 * first.varcomp[2].vcov);
  EXPECT_NEAR(other.varcomp[3].vcov, first.varcomp[3].vcov, 1e-6 * first.varcomp[3].vcov);
}

TEST(FittingUnits, takes_precise_observations_for_what_they_are) {
  LoadedModule loaded;
  const Fit precise =
      fit(random_model({.rows = 60, .noise = 4e-4, .terms = {{.levels = 8, .sd = 2.0}}}, 1), loaded.module());
  EXPECT_EQ(precise.convergence, Convergence::converged);
  EXPECT_FALSE(precise.singular);
  EXPECT_TRUE(precise.messages.empty()) << precise.messages.front();
}

// Of intercepts and slopes whose correlation is -1 but for `size` squared.
void expect_exact_criteria(const Model& model, double first_size, double shrink, double tolerance) {
  LoadedModule loaded;
  const DenseOracle oracle(model);
  for (double size = first_size; size > 1e-8; size /= shrink) {
    FitOptions options;
    options.variances = {1.0, -0.5, 0.25 + size * size, 1.5};
    VectorL variances(4);
    for (std::size_t i = 0; i < 4; ++i) variances(static_cast<Eigen::Index>(i)) = options.variances[i];
    const Fit given = fit(model, loaded.module(), options);
    EXPECT_NEAR(given.criterion, static_cast<double>(oracle.criterion(variances, true)), tolerance) << size;
  }
}

TEST(FittingNearSingularity, keeps_the_criterion_of_an_intrinsic_field_exact) {
  const Model model =
      random_model({.rows = 90, .intercept = false, .terms = {{.coefs = 2, .levels = 20, .field = Field::ring}}}, 1);
  expect_exact_criteria(model, 0.1, 1.3, 1e-7);
}

// Pivots that are small but real, of effects so large that the criterion feels them.
TEST(FittingNearSingularity, takes_no_small_pivot_of_large_effects_for_none) {
  const Model model = random_model(
      {.rows = 90, .intercept = false, .terms = {{.coefs = 2, .levels = 60, .field = Field::ring, .sd = 100.0}}}, 3);
  expect_exact_criteria(model, 1e-3, 2.1, 1e-5);
}

TEST(FittingUnits, says_that_random_effects_explain_every_observation) {
  LoadedModule loaded;
  Model model = random_model({.rows = 60, .noise = 0.0, .terms = {{.levels = 8, .sd = 2.0}}}, 1);
  Random random(3);
  for (double& y : model.y) y += 1e-12 * random.normal();
  const Fit exact = fit(model, loaded.module());
  EXPECT_TRUE(exact.singular);
  ASSERT_FALSE(exact.messages.empty());
  EXPECT_NE(exact.messages.back().find("residual variance is practically zero"), std::string::npos);
}

INSTANTIATE_TEST_SUITE_P(Random, Fitting, testing::ValuesIn(cases()),
                         [](const auto& shown) { return shown.param.name; });

}  // namespace
}  // namespace sm::mixed::test
