#include "mixed/curvature.hpp"

#include <gtest/gtest.h>

#include <cmath>
#include <string>

#include "dense_oracle.hpp"
#include "loaded_module.hpp"
#include "mixed/optimum.hpp"
#include "random_models.hpp"

namespace sm::mixed::test {
namespace {

// The covariances that values of the parameters and a residual variance stand for, in the order of the oracle.
VectorL covariances(const ScaledDesign& design, const Parameters& parameters, const std::vector<double>& values,
                    Real variance) {
  const Factors factors = parameters.factors(values);
  std::vector<Real> all;
  for (std::size_t t = 0; t < factors.size(); ++t) {
    const Eigen::Index k = design.terms()[t].k;
    const MatrixL factor = Eigen::Map<const Eigen::MatrixXd>(factors[t].data(), k, k).cast<Real>();
    const MatrixL basis = Eigen::Map<const Eigen::MatrixXd>(design.terms()[t].basis.data(), k, k).cast<Real>();
    const MatrixL covariance = variance * basis * factor * factor.transpose() * basis.transpose();
    for (Eigen::Index b = 0; b < k; ++b) {
      for (Eigen::Index a = b; a < k; ++a) all.push_back(covariance(a, b));
    }
  }
  all.push_back(variance);
  return Eigen::Map<VectorL>(all.data(), static_cast<Eigen::Index>(all.size()));
}

// The covariances are quadratic in the values: their differences are derivatives.
class Quadratic {
 public:
  Quadratic(const ScaledDesign& design, const Parameters& parameters, std::vector<double> values, Real variance)
      : design_(design), parameters_(parameters), values_(std::move(values)), variance_(variance) {}

  VectorL first(std::size_t i) const { return (moved(i, 0.5, i, 0.0) - moved(i, -0.5, i, 0.0)); }
  VectorL second(std::size_t i, std::size_t j) const {
    return moved(i, 0.5, j, 0.5) - moved(i, 0.5, j, -0.5) - moved(i, -0.5, j, 0.5) + moved(i, -0.5, j, -0.5);
  }

 private:
  VectorL moved(std::size_t i, double by, std::size_t j, double and_by) const {
    std::vector<double> values = values_;
    values[i] += by;
    values[j] += and_by;
    return covariances(design_, parameters_, values, variance_);
  }

  const ScaledDesign& design_;
  const Parameters& parameters_;
  std::vector<double> values_;
  Real variance_;
};

struct Case {
  std::string name;
  ModelShape shape;
};

void PrintTo(const Case& c, std::ostream* out) { *out << c.name; }

class Curvature : public testing::TestWithParam<Case> {};

TEST_P(Curvature, is_the_average_information_of_dense_matrices_and_what_bends_the_covariances) {
  LoadedModule loaded;
  const Model model = random_model(GetParam().shape, 5);
  const ScaledDesign design(model);
  const DenseOracle oracle(model);
  Factors factors;
  for (const DesignTerm& term : design.terms()) {
    factors.push_back(term.k == 1 ? Dense{0.7} : Dense{0.8, -0.3, 0.0, 0.6});
  }
  const Parameters parameters(factors);
  const std::vector<double> values = parameters.values();
  for (const bool reml : {true, false}) {
    Likelihood likelihood(loaded.module(), design, reml);
    const CriterionParts parts = likelihood.evaluate(factors, true);
    ASSERT_TRUE(parts.defined);
    const std::vector<double> curvature = average_curvature(likelihood, parameters, factors, parts);
    const std::size_t m = values.size();
    ASSERT_EQ(curvature.size(), m * m);

    const double variance = parts.s2 / likelihood.degrees();
    const Quadratic quadratic(design, parameters, values, static_cast<Real>(variance));
    const DenseOracle::Answer answer =
        oracle.answer(covariances(design, parameters, values, static_cast<Real>(variance)), reml);
    const std::vector<double> slope = parameters.gradient(parts.s2_gradient);
    for (std::size_t i = 0; i < m; ++i) {
      for (std::size_t j = 0; j < m; ++j) {
        Real expected = 2.0L * quadratic.first(i).dot(answer.average * quadratic.first(j)) -
                        static_cast<Real>(slope[i] * slope[j] / (parts.s2 * variance));
        const VectorL bend = quadratic.second(i, j);
        for (std::size_t c = 0; c < oracle.parameters(); ++c) {
          expected += oracle.slope(answer, c, reml) * bend(static_cast<Eigen::Index>(c));
        }
        const double size = std::sqrt(std::abs(curvature[i * m + i] * curvature[j * m + j]));
        EXPECT_NEAR(curvature[j * m + i], static_cast<double>(expected), 1e-8 * (size + 1.0))
            << i << ", " << j << (reml ? " restricted" : "");
      }
    }
  }
}

const TermShape one{};
const TermShape slopes{.coefs = 2, .levels = 6};
INSTANTIATE_TEST_SUITE_P(
    OfModels, Curvature,
    testing::Values(Case{"one_term", {.terms = {one}}},
                    Case{"crossed", {.rows = 50, .weighted = true, .terms = {{.levels = 9}, {.levels = 4}}}},
                    Case{"slopes", {.aliased = 1, .factor = 3, .terms = {slopes, one}}},
                    Case{"a_chain_of_slopes", {.terms = {{.coefs = 2, .levels = 7, .field = Field::chain}, one}}},
                    Case{"a_ring", {.terms = {{.levels = 12, .field = Field::ring}, one}}}),
    [](const auto& tested) { return tested.param.name; });

TEST(Curvature, is_not_approximated_where_a_factor_is_singular) {
  LoadedModule loaded;
  const Model model = random_model({.terms = {{.coefs = 2, .levels = 6}}}, 5);
  const ScaledDesign design(model);
  Likelihood likelihood(loaded.module(), design, true);
  const Factors factors{{0.8, 0.3, 0.0, 0.0}};
  const CriterionParts parts = likelihood.evaluate(factors, true);
  EXPECT_TRUE(average_curvature(likelihood, Parameters(factors), factors, parts).empty());
}

// The approximation leads there, and each parameter then costs one evaluation for the Hessian.
TEST(Optimum, of_a_large_model_needs_few_evaluations) {
  LoadedModule loaded;
  const ModelShape shape{.rows = 9000, .terms = {{.coefs = 2, .levels = 1600, .sd = 0.3}, {.levels = 40, .sd = 3.0}}};
  const Model model = random_model(shape, 1);
  const ScaledDesign design(model);
  Likelihood likelihood(loaded.module(), design, true);
  const Optimum optimum =
      find_optimum(likelihood, {{1.0, 0.0, 0.0, 1.0}, {1.0}}, {.several_starts = false, .progress = {}});
  EXPECT_EQ(optimum.convergence, Convergence::converged);
  EXPECT_LE(likelihood.evaluations(), 9 + 4 + 1);

  const std::int64_t before = likelihood.evaluations();
  const CriterionParts there = likelihood.evaluate(optimum.factors(), true);
  EXPECT_EQ(likelihood.evaluations(), before) << "the search ends with an evaluation of something else";
  EXPECT_DOUBLE_EQ(likelihood.profiled(there), optimum.criterion);
  const std::vector<double> score = optimum.parameters.gradient(likelihood.profiled_gradient(there));
  const std::size_t m = score.size();
  for (std::size_t i = 0; i < m; ++i) {
    EXPECT_LT(std::abs(score[i]), 1e-6 * std::sqrt(optimum.hessian[i * m + i]));
  }
  // The Hessian is that of central differences.
  for (std::size_t j = 0; j < m; ++j) {
    const double step = 1e-3 / std::sqrt(optimum.hessian[j * m + j]);
    std::vector<double> slope(m, 0.0);
    for (const double sign : {1.0, -1.0}) {
      std::vector<double> values = optimum.values;
      values[j] += sign * step;
      const CriterionParts parts = likelihood.evaluate(optimum.parameters.factors(values), true);
      const std::vector<double> gradient = optimum.parameters.gradient(likelihood.profiled_gradient(parts));
      for (std::size_t i = 0; i < m; ++i) slope[i] += sign * gradient[i] / (2.0 * step);
    }
    for (std::size_t i = 0; i < m; ++i) {
      const double size = std::sqrt(optimum.hessian[i * m + i] * optimum.hessian[j * m + j]);
      EXPECT_NEAR(optimum.hessian[j * m + i], slope[i], 1e-4 * size) << i << ", " << j;
    }
  }
}

}  // namespace
}  // namespace sm::mixed::test
