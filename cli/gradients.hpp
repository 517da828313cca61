// Solutions by conjugate gradients, through the module, one right-hand side at a time: each has its own history, and
// one that does not converge does not keep the others from being solved.
#pragma once

#include <cstdint>
#include <vector>

#include "cli/run.hpp"

namespace sm::cli {

struct GradientLimits {
  double tolerance = 0.0;
  std::int64_t max_iterations = 0;
};

// What became of one right-hand side. Residuals here are sqrt(r' M r), M the inverse of the diagonal of A, as parts of
// what they were for x = 0.
struct GradientOutcome {
  bool converged = false;
  bool empty_row = false;  // b is not zero in a row without a diagonal entry above 0: A x = b has no solution
  std::int64_t iterations = 0;
  double residual = 0.0;        // the last one; NaN when the iteration broke down
  std::vector<double> history;  // after each step, when it was asked for
};

// Solves A x = b for the symmetric matrix of the run. Empty when A has a negative diagonal entry; the report of the run
// says so then. Throws CommandError.
std::vector<GradientOutcome> solve_by_gradients(Run& run, const Columns& b, const GradientLimits& limits,
                                                bool with_history, std::vector<double>& x);

}  // namespace sm::cli
