/* Iterative solution. */
#ifndef QXESM_ITERATIVE_H
#define QXESM_ITERATIVE_H

#include <qxesm/instance.h>

/* x <- A^- b by conjugate gradients with a diagonal preconditioner, without factoring A; a diagonal matrix is divided
 * by.
 *   b, x            n x nrhs, column-major, different arrays; x starts from 0
 *   max_iterations  below 1: n + 2
 *   iterations      out  steps taken for the last right-hand side that was worked on
 *   residual        out  its last rho = r' M r, M the inverse of the diagonal of A (0 for an element that has none)
 *   tolerance       a right-hand side has converged when rho <= tolerance^2 times its first rho; negative or NaN:
 *                   setting 2
 * The residual is recomputed exactly after step 1, 51, 101, ... The instance's progress callback, if any, is called
 * after every step.
 * Answers: 0 with nothing done (empty); 1; 113; 104 (x is b), all with the outputs untouched; then 124 (general) with
 * iterations 0 and residual 0; 0 (nrhs < 1) likewise; 101; 103 (a diagonal element below the negative limit), with
 * iterations 0; 109 (limit reached, told to stop, or rho not a number; x holds the last iterate, later right-hand sides
 * 0); 0. Diagonal: elements of magnitude 1.11e-12 or less give 0. Work: 4n doubles, and 3n/2 words for a
 * symmetric sparse A. Cost: one product with A a step, and one more every 50. */
QXESM_API SmStatus qxsmsolioc(SmMatrix* a, const double* b, double* x, int32_t nrhs, int64_t max_iterations,
                              int64_t* iterations, double* residual, double tolerance);

/* Called after a step: rho, the matrix's solver_word, steps so far. Non-zero stops the solve with 109. */
typedef int32_t (*SmProgress)(void* context, double rho, int64_t user_word, int64_t iteration);

/* Sets the instance's callback; null for none, as at creation. Not in the table. Answers 0. */
QXESM_API SmStatus qxsmsetprogress(SmInstance* instance, SmProgress callback, void* context);

#endif
