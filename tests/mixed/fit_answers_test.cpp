// What a fit says beside its estimates: boundaries, functions of the effects, given variances, and refusals.
#include <gtest/gtest.h>

#include <algorithm>
#include <cmath>
#include <numeric>

#include "dense_oracle.hpp"
#include "loaded_module.hpp"
#include "mixed/error.hpp"
#include "mixed/estimate.hpp"
#include "random_models.hpp"

namespace sm::mixed::test {
namespace {

const TermShape kGroups{.levels = 8, .sd = 2.0};
const TermShape kSlopes{.coefs = 2, .levels = 10, .sd = 1.5};

VectorL components(const Fit& fit) {
  VectorL all(static_cast<Eigen::Index>(fit.varcomp.size()));
  for (std::size_t i = 0; i < fit.varcomp.size(); ++i) all(static_cast<Eigen::Index>(i)) = fit.varcomp[i].vcov;
  return all;
}

// Four observations in each of five groups, the groups alike.
Model model_without_group_variance() {
  Model model = random_model({.rows = 20, .numeric = 0, .terms = {{.levels = 5}}}, 1);
  for (std::size_t i = 0; i < model.y.size(); ++i) {
    model.random[0].level[i] = static_cast<std::int64_t>(i / 4);
    model.y[i] = 10.0 + static_cast<double>(i % 4);
  }
  return model;
}

TEST(Boundary, of_a_variance_is_zero_exactly_and_said_in_words) {
  LoadedModule loaded;
  const Model model = model_without_group_variance();
  for (const bool reml : {true, false}) {
    const Fit fitted = fit(model, loaded.module(), {.reml = reml});
    const double degrees = reml ? 19.0 : 20.0;
    EXPECT_EQ(fitted.convergence, Convergence::converged);
    EXPECT_TRUE(fitted.singular);
    ASSERT_EQ(fitted.messages.size(), 1U);
    EXPECT_NE(fitted.messages[0].find("'g0'"), std::string::npos);
    EXPECT_NE(fitted.messages[0].find("its variance is zero"), std::string::npos);
    EXPECT_EQ(fitted.varcomp[0].vcov, 0.0);
    EXPECT_EQ(fitted.theta[0], 0.0);
    EXPECT_FALSE(fitted.varcomp[0].se_observed);
    // What is left is a mean: sum of squares 25, and the variance of a variance is 2 v^2 / d.
    const double variance = 25.0 / degrees;
    EXPECT_NEAR(fitted.varcomp[1].vcov, variance, 1e-12);
    ASSERT_TRUE(fitted.varcomp[1].se_observed);
    EXPECT_NEAR(*fitted.varcomp[1].se_observed, variance * std::sqrt(2.0 / degrees), 1e-9);
    EXPECT_NEAR(*fitted.varcomp[1].se_average, variance * std::sqrt(2.0 / degrees), 1e-9);
    ASSERT_TRUE(fitted.fixef[0].df);
    EXPECT_NEAR(*fitted.fixef[0].df, degrees, 1e-6);
    for (const double sd : fitted.ranef[0].pev_sd) EXPECT_EQ(sd, 0.0);
    for (const double sd : fitted.ranef[0].cond_sd) EXPECT_EQ(sd, 0.0);
  }
}

// Slopes that are three times the intercepts.
Model model_with_one_direction(std::uint64_t seed) {
  Model model = random_model({.rows = 120, .noise = 0.3, .terms = {kSlopes}}, seed);
  Random random(seed + 50);
  std::vector<double> effects(10);
  for (double& effect : effects) effect = random.normal();
  for (std::size_t i = 0; i < model.y.size(); ++i) {
    model.y[i] =
        random.normal() + effects[std::size_t(model.random[0].level[i])] * (1.0 + 3.0 * model.random[0].z[2 * i + 1]);
  }
  return model;
}

TEST(Boundary, of_a_correlation_is_one_and_no_direction_leads_inside) {
  LoadedModule loaded;
  int found = 0;
  for (std::uint64_t seed = 1; seed <= 6; ++seed) {
    const Model model = model_with_one_direction(seed);
    const DenseOracle oracle(model);
    const Fit fitted = fit(model, loaded.module());
    ASSERT_EQ(fitted.convergence, Convergence::converged);
    const VectorL here = components(fitted);
    const Real criterion = oracle.criterion(here, true);
    for (int direction = 0; direction < 12; ++direction) {
      const double angle = 0.2618 * direction;
      VectorL there = here;
      const Real step = 1e-4L * (here(0) + here(2));
      there(0) += step * std::cos(angle) * std::cos(angle);
      there(1) += step * std::cos(angle) * std::sin(angle);
      there(2) += step * std::sin(angle) * std::sin(angle);
      EXPECT_GE(oracle.criterion(there, true), criterion - 1e-9L) << "seed " << seed << " direction " << direction;
    }
    if (!fitted.singular) continue;
    ++found;
    EXPECT_NEAR(std::abs(fitted.varcomp[1].sdcor), 1.0, 1e-12);
    EXPECT_EQ(fitted.theta[2], 0.0);
    EXPECT_EQ(fitted.free, std::vector<std::size_t>{3});
    EXPECT_NE(fitted.messages.at(0).find("rank 1"), std::string::npos);
  }
  EXPECT_GE(found, 1) << "no seed led to the boundary";
}

TEST(GivenVariances, are_used_as_they_are) {
  LoadedModule loaded;
  const Model model = random_model({.rows = 60, .terms = {kSlopes, kGroups}}, 3);
  const DenseOracle oracle(model);
  const std::vector<double> variances{2.0, -0.5, 1.0, 3.0, 1.5};
  const Fit fitted = fit(model, loaded.module(), {.variances = variances});
  VectorL given(5);
  for (std::size_t i = 0; i < 5; ++i) given(static_cast<Eigen::Index>(i)) = variances[i];
  const DenseOracle::Answer answer = oracle.answer(given, true);
  EXPECT_TRUE(fitted.variances_given);
  EXPECT_TRUE(fitted.iterations.empty());
  EXPECT_NEAR(fitted.criterion, static_cast<double>(oracle.criterion(given, true)), 1e-9);
  for (std::size_t j = 0; j < 2; ++j) {
    const auto e = static_cast<Eigen::Index>(j);
    EXPECT_NEAR(fitted.fixef[j].estimate, static_cast<double>(answer.beta(e)), 1e-10);
    EXPECT_NEAR(fitted.fixef[j].se, static_cast<double>(std::sqrt(answer.beta_covariance(e, e))), 1e-10);
    EXPECT_FALSE(fitted.fixef[j].df);
  }
  for (std::size_t l = 0; l < 8; ++l) {
    const auto e = static_cast<Eigen::Index>(l);
    EXPECT_NEAR(fitted.ranef[2].estimate[l], static_cast<double>(answer.random[1](e)), 1e-10);
    EXPECT_NEAR(fitted.ranef[2].pev_sd[l], static_cast<double>(std::sqrt(answer.random_covariance[1](e, e))), 1e-10);
  }
  EXPECT_NEAR(fitted.ypy,
              static_cast<double>(Eigen::Map<const Eigen::VectorXd>(model.y.data(), 60).cast<Real>().dot(answer.py)),
              1e-8);
}

// Equations of the effects themselves, written down densely.
TEST(GivenVariances, give_the_determinant_and_rank_of_the_equations) {
  LoadedModule loaded;
  const Model model = random_model({.rows = 40, .aliased = 1, .terms = {kGroups}}, 3);
  const DenseOracle oracle(model);
  const Fit fitted = fit(model, loaded.module(), {.variances = {3.0, 1.5}});
  MatrixL m(40, 10);
  m << oracle.z(0), oracle.x();
  MatrixL equations = m.transpose() * m / 1.5L;
  equations.topLeftCorner(8, 8) += MatrixL::Identity(8, 8) / 3.0L;
  EXPECT_NEAR(fitted.log_det_equations, static_cast<double>(log_det(equations)), 1e-10);
  EXPECT_EQ(fitted.rank_equations, 10);
}

// Of a level that is all but fixed, the conditional variance is next to nothing of the prediction variance.
TEST(GivenVariances, give_conditional_deviations_however_large_a_variance_is) {
  LoadedModule loaded;
  const Model model = random_model({.rows = 60, .terms = {kGroups}}, 3);
  for (const double variance : {1.0, 1e6, 1e12}) {
    const Fit fitted = fit(model, loaded.module(), {.variances = {variance, 1.0}});
    for (std::size_t l = 0; l < 8; ++l) {
      const std::vector<std::int64_t>& level = model.random[0].level;
      const auto records = static_cast<double>(std::count(level.begin(), level.end(), static_cast<std::int64_t>(l)));
      const double deviation = 1.0 / std::sqrt(records + 1.0 / variance);
      EXPECT_NEAR(fitted.ranef[0].cond_sd[l], deviation, 1e-8) << variance << ", level " << l;
    }
  }
}

TEST(GivenVariances, give_reliabilities_where_inbreeding_is_known) {
  LoadedModule loaded;
  Model model = random_model({.rows = 40, .terms = {{.levels = 9, .field = Field::chain}}}, 3);
  auto precision = std::make_shared<Precision>(*model.random[0].precision);
  for (int l = 0; l < 9; ++l) precision->inverse_diagonal_excess.push_back(0.125 * l);
  model.random[0].precision = precision;
  const Fit fitted = fit(model, loaded.module(), {.variances = {3.0, 1.5}});
  ASSERT_EQ(fitted.ranef[0].reliability.size(), 9U);
  for (std::size_t l = 0; l < 9; ++l) {
    const double pev = fitted.ranef[0].pev_sd[l] * fitted.ranef[0].pev_sd[l];
    EXPECT_NEAR(fitted.ranef[0].reliability[l], 1.0 - pev / (3.0 * (1.0 + 0.125 * static_cast<double>(l))), 1e-12);
  }
}

TEST(Contrasts, are_estimated_or_refused) {
  LoadedModule loaded;
  const Model model = random_model({.rows = 70, .numeric = 2, .aliased = 1, .factor = 3, .terms = {kGroups}}, 2);
  const DenseOracle oracle(model);
  // Columns x0 to x4 and a0 = -1.5 x0 - 0.5 x1 + 1.5 x3 + 2.5 x4.
  ASSERT_EQ(model.fixed.dependence, (std::vector<double>{-1.5, -0.5, 0.0, 1.5, 2.5}));
  const std::vector<ContrastRequest> requests{{"kept", {0.0, 1.0, -1.0, 0.0, 0.0, -0.5}},
                                              {"aliased", {0.0, 0.0, 0.0, 0.0, 0.0, 1.0}},
                                              {"part", {0.0, 1.0, 0.0, 0.0, 0.0, 0.0}},
                                              {"whole", {1.0, 0.0, 0.0, 1.0, 0.0, 0.0}}};
  const Fit fitted = fit(model, loaded.module(), {.contrasts = requests});
  ASSERT_EQ(fitted.contrasts.size(), 4U);
  const DenseOracle::Answer answer = oracle.answer(components(fitted), true);
  for (const std::size_t c : {std::size_t{0}, std::size_t{3}}) {
    const Contrast& contrast = fitted.contrasts[c];
    EXPECT_TRUE(contrast.estimable) << contrast.reason;
    VectorL l(5);
    for (std::size_t j = 0; j < 5; ++j) l(static_cast<Eigen::Index>(j)) = requests[c].l[j];
    EXPECT_NEAR(contrast.estimate, static_cast<double>(l.dot(answer.beta)), 1e-9);
    EXPECT_NEAR(contrast.se, static_cast<double>(std::sqrt(l.dot(answer.beta_covariance * l))), 1e-9);
    ASSERT_TRUE(contrast.df);
    EXPECT_NEAR(*contrast.df, static_cast<double>(oracle.satterthwaite(answer, l, fitted.free)), 1e-4);
  }
  for (const std::size_t c : {std::size_t{1}, std::size_t{2}}) {
    EXPECT_FALSE(fitted.contrasts[c].estimable) << fitted.contrasts[c].name;
    EXPECT_NE(fitted.contrasts[c].reason.find("a0"), std::string::npos);
  }
  EXPECT_TRUE(fitted.fixef[5].aliased);
  EXPECT_EQ(fitted.fixef[5].dependence, "a0 = -1.5*x0 - 0.5*x1 + 1.5*x3 + 2.5*x4");
}

TEST(Ratios, have_standard_errors_by_the_delta_method) {
  LoadedModule loaded;
  const Model model = random_model({.rows = 90, .terms = {kGroups, {.levels = 12}}}, 2);
  const RatioRequest share{"share", [](std::span<const double> v, std::span<double> gradient) {
                             const double total = v[0] + v[1] + v[2];
                             gradient[0] = 1.0 / total - v[0] / (total * total);
                             gradient[1] = gradient[2] = -v[0] / (total * total);
                             return v[0] / total;
                           }};
  const Fit fitted = fit(model, loaded.module(), {.ratios = {share}});
  ASSERT_EQ(fitted.free.size(), 3U);
  const VectorL v = components(fitted);
  const MatrixL covariance = inverse_of(DenseOracle(model).answer(v, true).observed);
  const Real total = v.sum();
  VectorL gradient = VectorL::Constant(3, -v(0) / (total * total));
  gradient(0) += 1.0L / total;
  EXPECT_NEAR(fitted.ratios.at(0).estimate, static_cast<double>(v(0) / total), 1e-14);
  ASSERT_TRUE(fitted.ratios[0].se_delta);
  EXPECT_NEAR(*fitted.ratios[0].se_delta, static_cast<double>(std::sqrt(gradient.dot(covariance * gradient))), 1e-8);
}

TEST(Predictions, of_the_rows_of_the_fit_are_its_fitted_values) {
  LoadedModule loaded;
  const Model model = random_model({.rows = 60, .aliased = 1, .offset = 1990.0, .terms = {kSlopes, kGroups}}, 4);
  const Fit fitted = fit(model, loaded.module());
  std::vector<PredictionTerm> terms;
  for (const RandomTerm& term : model.random) terms.push_back({term.level, term.z});
  const std::vector<double> predicted = predict(fitted, model.fixed.x, terms);
  for (std::size_t i = 0; i < predicted.size(); ++i) {
    EXPECT_NEAR(predicted[i], fitted.fitted[i], 1e-7);
    EXPECT_NEAR(fitted.fitted[i] + fitted.residuals[i], model.y[i], 1e-12);
  }
  for (PredictionTerm& term : terms) term.level.assign(term.level.size(), -1);
  const std::vector<double> fixed = predict(fitted, model.fixed.x, terms);
  double sum = 0.0;
  for (std::size_t i = 0; i < fixed.size(); ++i) sum += std::abs(fixed[i] - predicted[i]);
  EXPECT_GT(sum, 1.0) << "random effects count where their levels are known";
  const double x1 = model.fixed.x.value[std::size_t(model.fixed.x.start[1])];
  const double by_hand = fitted.fixef[0].estimate + x1 * fitted.fixef[1].estimate + x1 * x1 * fitted.fixef[2].estimate;
  EXPECT_NEAR(fixed[0], by_hand, 1e-7);
}

TEST(Plans, say_what_the_fit_finds) {
  LoadedModule loaded;
  const Model model = random_model({.rows = 60, .terms = {kSlopes, kGroups}}, 4);
  const EquationFacts facts = plan(model, loaded.module());
  const Fit fitted = fit(model, loaded.module(), {.spy = true});
  EXPECT_EQ(facts.order, 30);
  EXPECT_EQ(facts.entries, fitted.equations.entries);
  EXPECT_EQ(facts.factor_entries, fitted.equations.factor_entries);
  EXPECT_GE(facts.factor_entries, facts.entries);
  EXPECT_GT(facts.bytes, 8.0 * static_cast<double>(facts.factor_entries));
  EXPECT_EQ(fitted.spy_equations.places.size(), static_cast<std::size_t>(facts.entries));
  EXPECT_EQ(fitted.spy_factor.places.size(), static_cast<std::size_t>(facts.factor_entries));
  for (const auto& [row, col] : fitted.spy_factor.places) {
    EXPECT_LE(row, col);
    EXPECT_LT(col, 30);
  }
}

TEST(ModelsWithoutRandomTerms, are_least_squares) {
  LoadedModule loaded;
  const Model model = random_model({.rows = 30, .numeric = 2, .weighted = true, .terms = {}}, 4);
  const DenseOracle oracle(model);
  for (const bool reml : {true, false}) {
    const Fit fitted = fit(model, loaded.module(), {.reml = reml, .spy = true});
    EXPECT_EQ(fitted.convergence, Convergence::converged);
    const DenseOracle::Answer answer = oracle.answer(components(fitted), reml);
    EXPECT_NEAR(fitted.criterion, static_cast<double>(oracle.criterion(components(fitted), reml)), 1e-10);
    EXPECT_NEAR(static_cast<double>(oracle.slope(answer, 0, reml)), 0.0, 1e-9);
    for (std::size_t j = 0; j < 3; ++j) {
      EXPECT_NEAR(fitted.fixef[j].estimate, static_cast<double>(answer.beta(static_cast<Eigen::Index>(j))), 1e-10);
      ASSERT_TRUE(fitted.fixef[j].df);
      EXPECT_NEAR(*fitted.fixef[j].df, reml ? 27.0 : 30.0, 1e-6);
    }
  }
}

TEST(Searches, stop_when_they_are_told_to) {
  LoadedModule loaded;
  const Model model = random_model({.rows = 60, .terms = {kSlopes, kGroups}}, 4);
  int calls = 0;
  const Fit fitted = fit(model, loaded.module(), {.progress = [&](const Iteration&) { return ++calls < 3; }});
  EXPECT_EQ(calls, 3);
  EXPECT_EQ(fitted.convergence, Convergence::stopped);
  EXPECT_EQ(fitted.iterations.size(), 3U);
  EXPECT_FALSE(fitted.varcomp[0].se_observed);
  EXPECT_EQ(fitted.fitted.size(), 60U);
}

TEST(ManyColumns, keep_their_standard_errors) {
  LoadedModule loaded;
  const Model model = random_model({.rows = 80, .numeric = 2, .factor = 4, .offset = 1990.0, .terms = {kGroups}}, 6);
  const Fit all = fit(model, loaded.module());
  const Fit few = fit(model, loaded.module(), {.max_vcov = 3});
  EXPECT_EQ(all.vcov_fixef.size(), all.fixef.size() * all.fixef.size());
  EXPECT_TRUE(few.vcov_fixef.empty());
  for (std::size_t j = 0; j < all.fixef.size(); ++j) {
    EXPECT_NEAR(few.fixef[j].estimate, all.fixef[j].estimate, 1e-9 * std::abs(all.fixef[j].estimate)) << j;
    EXPECT_NEAR(few.fixef[j].se, all.fixef[j].se, 1e-9 * all.fixef[j].se) << j;
    EXPECT_FALSE(few.fixef[j].df);
  }
}

std::string refusal(const Model& model, const FitOptions& options) {
  LoadedModule loaded;
  try {
    fit(model, loaded.module(), options);
  } catch (const ModelError& error) {
    return error.what();
  }
  return "none";
}

TEST(Refusals, name_cause_and_remedy) {
  const Model model = random_model({.rows = 20, .terms = {kGroups}}, 1);
  EXPECT_EQ(refusal(model, {.variances = {1.0}}),
            "1 variances are given, expected 2; give those of each random term, and of the residuals last");
  EXPECT_EQ(refusal(model, {.variances = {1.0, 0.0}}),
            "the residual variance is 0, expected a positive number; give the residual variance last");
  EXPECT_EQ(refusal(model, {.variances = {-1.0, 1.0}}),
            "'g0': the given covariance matrix is not positive semidefinite; correct its variances or covariances");
  EXPECT_EQ(refusal(model, {.start = {1.0, 2.0}}),
            "the start has 2 parameters, expected 1; start from a fit of the same random terms");
  const Model small = random_model({.rows = 2, .terms = {{.levels = 2}}}, 1);
  EXPECT_EQ(
      refusal(small, {}),
      "2 observations do not determine 2 fixed effects and a residual variance; leave terms out of the fixed part, or "
      "use more data");
}

TEST(Rows, may_stand_in_any_order) {
  LoadedModule loaded;
  const Model model = random_model({.rows = 60, .aliased = 1, .factor = 3, .weighted = true, .terms = {kSlopes}}, 8);
  Model turned = model;
  const auto n = model.rows();
  std::reverse(turned.y.begin(), turned.y.end());
  std::reverse(turned.weights.begin(), turned.weights.end());
  std::reverse(turned.random[0].level.begin(), turned.random[0].level.end());
  for (std::size_t i = 0; i < 60; ++i) {
    for (std::size_t c = 0; c < 2; ++c) turned.random[0].z[2 * i + c] = model.random[0].z[2 * (59 - i) + c];
  }
  SparseColumns& x = turned.fixed.x;
  for (std::size_t j = 0; j + 1 < x.start.size(); ++j) {
    std::reverse(x.row.begin() + x.start[j], x.row.begin() + x.start[j + 1]);
    std::reverse(x.value.begin() + x.start[j], x.value.begin() + x.start[j + 1]);
  }
  for (std::int64_t& row : x.row) row = n - 1 - row;
  const Fit straight = fit(model, loaded.module());
  const Fit back = fit(turned, loaded.module());
  EXPECT_NEAR(straight.criterion, back.criterion, 1e-9);
  for (std::size_t i = 0; i < straight.varcomp.size(); ++i) {
    EXPECT_NEAR(straight.varcomp[i].vcov, back.varcomp[i].vcov, 1e-8 * straight.varcomp[0].vcov);
  }
  for (std::size_t i = 0; i < 60; ++i) EXPECT_NEAR(straight.fitted[i], back.fitted[59 - i], 1e-8);
}

}  // namespace
}  // namespace sm::mixed::test
