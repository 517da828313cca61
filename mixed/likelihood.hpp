// The profiled criterion of a mixed model, -2 log (restricted) likelihood at the best residual variance, with its
// derivatives by the relative covariance factors.
//
// With C the equations and (b, beta) their solution, r = y - X beta - Z T b and s2 = r'Wr + b'Kb, the restricted
// criterion is d (1 + log(2 pi s2 / d)) + log|C| - log|K| - log|W| with d = n - rank X, up to the scales of X; see
// Henderson (1973), Graser, Smith and Tier (1987), Bates and DeBoer (2004). s2 is a sum of squares, nothing cancels.
#pragma once

#include <memory>

#include "mixed/constraint.hpp"
#include "mixed/equations.hpp"
#include "mixed/null_space.hpp"

namespace sm::mixed {

// The criterion at residual variance v is d log(2 pi v) + log_det + s2 / v.
struct CriterionParts {
  bool defined = false;
  double log_det = 0.0;
  double s2 = 0.0;
  Factors log_det_gradient;
  Factors s2_gradient;
};

class Likelihood {
 public:
  Likelihood(Module& module, const ScaledDesign& design, bool reml);

  // The last evaluation leaves its factor and its solution; once more at the same factors costs nothing.
  CriterionParts evaluate(const Factors& factors, bool with_gradient);
  double degrees() const { return degrees_; }
  double profiled(const CriterionParts& parts) const;
  Factors profiled_gradient(const CriterionParts& parts) const;
  double at_variance(const CriterionParts& parts, double variance) const;

  // For another response in place of y, at the last factors: unknowns and residuals. Sums of squares of a solution err
  // by the square of its error, without refinement too.
  struct Solution {
    std::vector<double> unknowns;
    std::vector<double> residual;
  };
  Solution solve_response(std::span<const double> response, const Factors& factors, int refinements);

  const ScaledDesign& design() const { return design_; }
  const Gram& gram() const { return gram_; }
  bool reml() const { return reml_; }
  const std::vector<double>& solution() const { return solved_.unknowns; }  // b and transformed beta
  const std::vector<double>& residual() const { return solved_.residual; }  // of each observation
  Equations& equations() { return all_; }
  Equations& random_equations() { return *random_; }  // after factor_random
  const Constraint& constraint() const { return constraint_; }
  // Of the random effects alone, with what constrains them: the fixed effects are given. Made on demand; false when
  // there is no factor.
  bool factor_random(const Factors& factors);
  const Constraint& random_constraint() const { return random_constraint_; }
  const std::string& doubt() const { return doubt_; }
  std::int64_t evaluations() const { return evaluations_; }

 private:
  CriterionParts value(const Factors& factors);
  double sum_of_squares() const;
  Factors gradient_of_squares(const Factors& factors);

  const ScaledDesign& design_;
  Gram gram_;
  bool reml_;
  double degrees_;
  double constants_ = 0.0;  // of the log-determinant
  Equations all_;
  std::unique_ptr<Equations> random_;
  NullSpace null_space_;
  NullSpace random_null_space_;
  Constraint constraint_;
  Constraint random_constraint_;
  Solution solved_;
  Factors last_factors_;
  CriterionParts last_;  // not defined before the first evaluation, and after one without a result
  std::string doubt_;
  std::int64_t evaluations_ = 0;
};

}  // namespace sm::mixed
