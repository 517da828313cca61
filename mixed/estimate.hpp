// From a model to a fit.
#pragma once

#include <functional>
#include <span>
#include <string>
#include <vector>

#include "mixed/fit.hpp"
#include "mixed/model.hpp"
#include "mixed/module.hpp"

namespace sm::mixed {

// A function of the variance components in the order of Fit::varcomp; its derivatives go to `gradient`, of the same
// length.
struct RatioRequest {
  std::string name;
  std::function<double(std::span<const double> vcov, std::span<double> gradient)> value;
};

struct ContrastRequest {
  std::string name;
  std::vector<double> l;  // over all columns of X, aliased ones included
};

struct FitOptions {
  bool reml = true;
  std::vector<double> start{};      // as Fit::theta; empty: 1 for variances, 0 for covariances
  std::vector<double> variances{};  // as the vcov of Fit::varcomp: given, nothing is iterated; empty: estimated
  std::vector<ContrastRequest> contrasts{};
  std::vector<RatioRequest> ratios{};
  std::int64_t max_vcov = 1000;  // columns of X up to which Fit::vcov_fixef and degrees of freedom are computed
  int max_iterations = 200;
  bool derivative_free = false;
  bool spy = false;                                  // patterns of the equations and the factor
  std::function<bool(const Iteration&)> progress{};  // false: stop here
};

// Throws ModelError for a model that cannot be fitted, and what Module::expect_ok throws.
Fit fit(const Model& model, Module& module, const FitOptions& options = {});

// What fitting would take: nothing is factored.
EquationFacts plan(const Model& model, Module& module, bool reml = true);

// Rows of other data: their X, and for each random term of the model their level (-1: not among those of the model,
// with an effect of 0) and covariates.
struct PredictionTerm {
  std::vector<std::int64_t> level;
  std::vector<double> z;  // rows x k by rows
};
std::vector<double> predict(const Fit& fit, const SparseColumns& x, const std::vector<PredictionTerm>& terms);

}  // namespace sm::mixed
