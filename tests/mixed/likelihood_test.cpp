#include "mixed/likelihood.hpp"

#include <gtest/gtest.h>

#include <cmath>

#include "dense_oracle.hpp"
#include "loaded_module.hpp"
#include "random_models.hpp"

namespace sm::mixed::test {
namespace {

std::size_t at(std::int64_t i) { return static_cast<std::size_t>(i); }

Factors random_factors(const ScaledDesign& design, Random& random) {
  Factors factors;
  for (const DesignTerm& term : design.terms()) {
    const auto k = at(term.k);
    std::vector<double> factor(k * k, 0.0);
    for (std::size_t b = 0; b < k; ++b) {
      for (std::size_t a = b; a < k; ++a) factor[b * k + a] = a == b ? 0.3 + random.uniform() : 0.5 * random.normal();
    }
    factors.push_back(factor);
  }
  return factors;
}

// The covariances that factors and a residual variance stand for, in the order of the oracle.
VectorL covariances(const ScaledDesign& design, const Factors& factors, Real variance) {
  std::vector<Real> all;
  for (std::size_t t = 0; t < factors.size(); ++t) {
    const Eigen::Index k = design.terms()[t].k;
    const MatrixL factor = Eigen::Map<const Eigen::MatrixXd>(factors[t].data(), k, k).cast<Real>();
    const MatrixL basis = Eigen::Map<const Eigen::MatrixXd>(design.terms()[t].basis.data(), k, k).cast<Real>();
    const MatrixL product = basis * factor;
    const MatrixL covariance = variance * product * product.transpose();
    for (Eigen::Index b = 0; b < k; ++b) {
      for (Eigen::Index a = b; a < k; ++a) all.push_back(covariance(a, b));
    }
  }
  all.push_back(variance);
  return Eigen::Map<VectorL>(all.data(), static_cast<Eigen::Index>(all.size()));
}

struct Case {
  std::string name;
  ModelShape shape;
};

void PrintTo(const Case& c, std::ostream* out) { *out << c.name; }

std::vector<Case> cases() {
  const TermShape one{};
  const TermShape slope{.coefs = 2, .levels = 6};
  const TermShape three{.coefs = 3, .levels = 4};
  return {
      {"one_term", {.terms = {one}}},
      {"weighted", {.weighted = true, .terms = {one}}},
      {"crossed_terms", {.rows = 50, .terms = {{.levels = 9}, {.levels = 4}}}},
      {"correlated_slopes", {.terms = {slope}}},
      {"three_coefficients_and_another_term",
       {.rows = 60, .factor = 3, .weighted = true, .terms = {three, one, slope}}},
      {"aliased_columns", {.numeric = 2, .aliased = 2, .factor = 3, .terms = {one}}},
      {"no_fixed_effects", {.numeric = 0, .intercept = false, .terms = {slope}}},
      {"a_chain", {.terms = {{.levels = 12, .field = Field::chain}}}},
      {"a_chain_of_slopes", {.terms = {{.coefs = 2, .levels = 7, .field = Field::chain}, one}}},
      {"a_ring", {.terms = {{.levels = 12, .field = Field::ring}}}},
      {"a_ring_and_aliased_columns", {.aliased = 1, .factor = 3, .terms = {{.levels = 12, .field = Field::ring}, one}}},
      {"a_ring_without_intercept", {.intercept = false, .terms = {{.levels = 12, .field = Field::ring}}}},
      {"a_ring_of_slopes", {.terms = {{.coefs = 2, .levels = 6, .field = Field::ring}}}},
      {"two_rings", {.rows = 60, .terms = {{.levels = 9, .field = Field::ring}, {.levels = 12, .field = Field::ring}}}},
      {"two_rings_without_intercept",
       {.rows = 60,
        .intercept = false,
        .terms = {{.levels = 9, .field = Field::ring}, {.levels = 12, .field = Field::ring}}}},
      {"years_and_their_squares", {.offset = 1990.0, .terms = {one}}},
      {"slopes_on_years", {.terms = {{.coefs = 2, .levels = 5, .centred = false}}}},
      {"a_distant_response", {.response_offset = 1e7, .terms = {slope}}},
      {"two_levels", {.rows = 5, .terms = {{.levels = 2}}}},
  };
}

class Criterion : public testing::TestWithParam<Case> {};

TEST_P(Criterion, equals_that_of_dense_matrices) {
  LoadedModule loaded;
  for (std::uint64_t seed = 1; seed <= 3; ++seed) {
    const Model model = random_model(GetParam().shape, seed);
    const ScaledDesign design(model);
    const DenseOracle oracle(model);
    Random random(seed + 100);
    for (const bool reml : {true, false}) {
      Likelihood likelihood(loaded.module(), design, reml);
      for (const double scale : {1.0, 1e-2, 1e2, 0.0}) {
        Factors factors = random_factors(design, random);
        for (auto& factor : factors) {
          for (double& element : factor) element *= scale;
        }
        const CriterionParts parts = likelihood.evaluate(factors, false);
        ASSERT_TRUE(parts.defined) << likelihood.doubt();
        const Real variance = static_cast<Real>(parts.s2) / static_cast<Real>(likelihood.degrees());
        const Real expected = oracle.criterion(covariances(design, factors, variance), reml);
        EXPECT_NEAR(likelihood.profiled(parts), static_cast<double>(expected),
                    1e-9 * std::abs(static_cast<double>(expected)))
            << "seed " << seed << (reml ? " restricted" : "") << " scale " << scale;
      }
    }
  }
}

// Null vectors of two precisions that the data see alike: one row is superfluous, and which one depends on the factors.
TEST(TwoFields, are_told_apart_down_to_factors_of_zero) {
  LoadedModule loaded;
  const Model model = random_model(
      {.rows = 60, .terms = {{.levels = 9, .field = Field::ring}, {.levels = 12, .field = Field::ring}}}, 1);
  const ScaledDesign design(model);
  const DenseOracle oracle(model);
  Likelihood likelihood(loaded.module(), design, false);
  for (const double small : {1e-1, 1e-3, 1e-5, 1e-7, 0.0}) {
    for (const Factors& factors : {Factors{{small}, {1.3}}, Factors{{1.3}, {small}}, Factors{{small}, {small}}}) {
      const CriterionParts parts = likelihood.evaluate(factors, false);
      ASSERT_TRUE(parts.defined) << likelihood.doubt();
      const Real variance = static_cast<Real>(parts.s2) / static_cast<Real>(likelihood.degrees());
      const auto expected = static_cast<double>(oracle.criterion(covariances(design, factors, variance), false));
      EXPECT_NEAR(likelihood.profiled(parts), expected, 1e-9 * std::abs(expected)) << small;
    }
  }
}

TEST_P(Criterion, has_the_gradient_of_dense_differences) {
  LoadedModule loaded;
  const Model model = random_model(GetParam().shape, 4);
  const ScaledDesign design(model);
  const DenseOracle oracle(model);
  Random random(7);
  const Factors factors = random_factors(design, random);
  for (const bool reml : {true, false}) {
    Likelihood likelihood(loaded.module(), design, reml);
    const CriterionParts parts = likelihood.evaluate(factors, true);
    ASSERT_TRUE(parts.defined) << likelihood.doubt();
    const Real variance = static_cast<Real>(parts.s2) / static_cast<Real>(likelihood.degrees());
    for (std::size_t t = 0; t < factors.size(); ++t) {
      for (std::size_t e = 0; e < factors[t].size(); ++e) {
        const double step = 1e-4;
        Factors there = factors;
        there[t][e] += step;
        const Real up = oracle.criterion(covariances(design, there, variance), reml);
        there[t][e] = factors[t][e] - step;
        const Real down = oracle.criterion(covariances(design, there, variance), reml);
        const double expected = static_cast<double>((up - down) / (2.0L * step));
        const double gradient = parts.log_det_gradient[t][e] + parts.s2_gradient[t][e] / static_cast<double>(variance);
        EXPECT_NEAR(gradient, expected, 1e-6 * (1.0 + std::abs(expected)))
            << "term " << t << " element " << e << (reml ? " REML" : " ML");
      }
    }
  }
}

INSTANTIATE_TEST_SUITE_P(Random, Criterion, testing::ValuesIn(cases()),
                         [](const auto& shown) { return shown.param.name; });

}  // namespace
}  // namespace sm::mixed::test
