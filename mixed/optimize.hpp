// Minimization of a smooth function of a few parameters whose every evaluation is dear: a profiled -2 log-likelihood.
#pragma once

#include <cstdint>
#include <functional>
#include <span>
#include <string>
#include <vector>

#include "mixed/fit.hpp"

namespace sm::mixed {

struct Evaluation {
  double value = 0.0;            // +inf outside the domain
  std::vector<double> gradient;  // exact to rounding where the value is finite
};

using Objective = std::function<Evaluation(std::span<const double>)>;

struct MinimiseOptions {
  int max_iterations = 200;
  double tolerance = 1e-12;                          // of the Newton decrement g' H^-1 g
  std::function<bool(const Iteration&)> progress{};  // false: stop
  bool derivative_free = false;                      // search by values alone
  // An approximation of the Hessian, by columns, at the point that was evaluated last, cheaper than an evaluation;
  // empty where there is none. Steps are taken with it; that a minimum is one is seen from differences all the same.
  std::function<std::vector<double>()> curvature{};
};

struct Minimum {
  std::vector<double> x;
  double value = 0.0;
  std::vector<double> gradient;
  std::vector<double> hessian;  // by columns, from differences of the gradient; after a stop, the model of the search
  Convergence convergence = Convergence::not_converged;
  std::string optimizer;  // what found x: "trust-region Newton", "NLopt BOBYQA"
  std::vector<Iteration> iterations;
  std::int64_t evaluations = 0;
};

// A local minimum near `start`. The function need not be convex, nor its Hessian regular: a stationary point that is
// a maximum or a saddle is left, also when it is where the search begins. `converged` means that at x the Newton
// decrement is within the tolerance and no direction leads down. When the trust region collapses, or max_iterations
// go by without that, NLopt takes over and the gradient decides in the end. Throws ModelError when the function has no
// finite value at the start.
Minimum minimise(const Objective& objective, std::vector<double> start, const MinimiseOptions& options = {});

}  // namespace sm::mixed
