// The minimum of the profiled criterion over relative covariance factors, the boundary included: a variance of zero
// or a correlation of one is a factor of lower rank.
#pragma once

#include <functional>
#include <string>
#include <vector>

#include "mixed/fit.hpp"
#include "mixed/likelihood.hpp"
#include "mixed/parameters.hpp"

namespace sm::mixed {

struct SearchOptions {
  int max_iterations = 200;
  bool derivative_free = false;
  bool several_starts = true;  // where evaluations are cheap
  std::function<bool(const Iteration&)> progress;
};

struct Optimum {
  Parameters parameters;  // those that are free there
  std::vector<double> values;
  double criterion = 0.0;
  std::vector<double> hessian;  // of the criterion by the values, by columns; sound when converged
  Convergence convergence = Convergence::not_converged;
  std::string optimizer;
  std::vector<Iteration> iterations;

  Factors factors() const { return parameters.factors(values); }
};

Optimum find_optimum(Likelihood& likelihood, const Factors& start, const SearchOptions& options);

}  // namespace sm::mixed
