/* Iterative solution. The operation of this header answers 124 in this release. */
#ifndef QXESM_ITERATIVE_H
#define QXESM_ITERATIVE_H

#include <qxesm/instance.h>

/* x <- A^- b by preconditioned conjugate gradients; b and x n x nrhs, different arrays. */
QXESM_API SmStatus qxsmsolioc(SmMatrix* a, const double* b, double* x, int32_t nrhs, int64_t max_iterations,
                              int64_t* iterations, double* residual, double tolerance);

#endif
