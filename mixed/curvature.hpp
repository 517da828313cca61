// An approximation of the Hessian of the profiled criterion that costs a solve for each parameter, where differences of
// the gradient cost a factorization and an inversion: the mean of the observed and the expected information (Gilmour,
// Thompson and Cullis, Biometrics 51 (1995) 1440-1450), in which the traces of products of P cancel.
#pragma once

#include <vector>

#include "mixed/likelihood.hpp"
#include "mixed/parameters.hpp"

namespace sm::mixed {

// By columns, at the factors that `likelihood` evaluated last, whose parts with the gradients are `parts`. Empty where
// a factor is nearly singular: what bends the criterion there is beyond the gradient.
std::vector<double> average_curvature(Likelihood& likelihood, const Parameters& parameters, const Factors& factors,
                                      const CriterionParts& parts);

}  // namespace sm::mixed
