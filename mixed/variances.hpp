// Variance components at the optimum: their values, and what the likelihood knows about them.
#pragma once

#include "mixed/estimate.hpp"
#include "mixed/factor_algebra.hpp"
#include "mixed/likelihood.hpp"
#include "mixed/optimum.hpp"
#include "mixed/parameters.hpp"

namespace sm::mixed {

// Relative factors of a term in the coordinates of the model, B T.
Dense model_factor(const ScaledDesign& design, const Factors& factors, std::size_t term);

// Covariance components at the given factors and residual variance, without standard errors; theta and the verdict
// on singularity too.
void set_variances(const ScaledDesign& design, const Factors& factors, double variance, Fit& fit);

// The inverse of the observed information for the free elements of the factors and, last, the logarithm of the residual
// variance; empty when the likelihood is not curved in every direction.
struct ParameterCovariance {
  Dense covariance;
  std::size_t count = 0;
  bool known() const { return !covariance.empty(); }
};
ParameterCovariance observed_covariance(Likelihood& likelihood, const Optimum& optimum, double variance);

// Free components, standard errors and both kinds of information.
void set_observed_information(const ScaledDesign& design, const Parameters& parameters,
                              const std::vector<double>& values, double variance, const ParameterCovariance& covariance,
                              Fit& fit);
// Likewise of the average information (Gilmour, Thompson and Cullis 1995); needs the factor at the optimum.
void set_average_information(Likelihood& likelihood, const Parameters& parameters, const std::vector<double>& values,
                             double variance, Fit& fit);

void set_ratios(const std::vector<RatioRequest>& requests, Fit& fit);

}  // namespace sm::mixed
