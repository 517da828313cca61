// The C boundary of the iterative solver.
#include "iterative/operations.hpp"

extern "C" SmStatus qxsmsolioc(SmMatrix* a, const double* b, double* x, int32_t nrhs, int64_t max_iterations,
                               int64_t* iterations, double* residual, double tolerance) {
  return sm::solve_iterative(*a, {b, x, nrhs, max_iterations, tolerance, *iterations, *residual});
}

extern "C" SmStatus qxsmsetprogress(SmInstance* instance, SmProgress callback, void* context) {
  sm::set_progress(*instance, callback, context);
  return SM_OK;
}
