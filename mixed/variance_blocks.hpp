// The variance components of a fit, term by term.
#pragma once

#include <cstddef>
#include <string>
#include <vector>

#include "mixed/fit.hpp"

namespace sm::mixed {

// A term's covariance matrix, as places in Fit::varcomp.
struct VarianceBlock {
  std::string group;
  std::vector<std::size_t> variances;                  // one a coefficient
  std::vector<std::vector<std::size_t>> correlations;  // [i][j], j < i: of coefficients i and j
};

// In the order of the fit, the residual variance last.
std::vector<VarianceBlock> variance_blocks(const std::vector<VarianceComponent>& components);

// "Subject (Intercept)", "Residual"
std::string variance_name(const VarianceComponent& component);

// What lies on the boundary of the parameter space, a sentence each.
std::vector<std::string> boundary_sentences(const std::vector<VarianceComponent>& components);

}  // namespace sm::mixed
