// Fixed effects, linear functions of them, and the predicted random effects.
#pragma once

#include "mixed/estimate.hpp"
#include "mixed/likelihood.hpp"
#include "mixed/variances.hpp"

namespace sm::mixed {

struct AtOptimum {
  const Parameters& parameters;
  Factors factors;
  double variance = 1.0;
  ParameterCovariance covariance;  // unknown: no degrees of freedom
};

// fixef, vcov_fixef; needs the factor of the equations at these values.
void set_fixed_effects(Likelihood& likelihood, const AtOptimum& optimum, std::int64_t max_vcov, Fit& fit);
void set_contrasts(Likelihood& likelihood, const AtOptimum& optimum, const std::vector<ContrastRequest>& requests,
                   Fit& fit);

// ranef with conditional and prediction standard deviations.
void set_random_effects(Likelihood& likelihood, const AtOptimum& optimum, Fit& fit);

}  // namespace sm::mixed
