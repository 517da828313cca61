// The C boundary of the iterative solver.
#include "iterative/operations.hpp"

extern "C" SmStatus qxsmsolioc(SmMatrix* a, const double* b, double* x, int32_t nrhs, int64_t max_iterations,
                               int64_t* iterations, double* residual, double tolerance) {
  sm::IterativeTask task = {b, x, nrhs, max_iterations, tolerance};
  const sm::i64 stored = a->nnz;
  const SmStatus status = sm::solve_iterative(*a, task);
  // Refusals before the kind was looked at leave the outputs alone.
  const bool refused = stored < 1 || status == SM_UNTYPED || status == SM_NOT_CLOSED || b == x;
  if (!refused) {
    *iterations = task.iterations;
    *residual = task.residual;
  }
  return status;
}

extern "C" SmStatus qxsmsetprogress(SmInstance* instance, SmProgress callback, void* context) {
  sm::set_progress(*instance, callback, context);
  return SM_OK;
}
