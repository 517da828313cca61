// Preconditioned conjugate gradients, behind the C boundary.
#pragma once

#include "frame/core.hpp"

namespace sm {

// What a solve is asked for, and where it reports.
struct IterativeTask {
  const double* b;
  double* x;
  i64 count;
  i64 max_iterations;
  double tolerance;
  i64& iterations;
  double& residual;
};

[[nodiscard]] SmStatus solve_iterative(SmMatrix& m, IterativeTask task);
void set_progress(SmInstance& instance, SmProgress callback, void* context);

}  // namespace sm
