/* Products and forms. Every operation of this header answers 124 in this release. */
#ifndef QXESM_FORMS_H
#define QXESM_FORMS_H

#include <qxesm/instance.h>

/* y <- A[r0..r1, c0..c1] x, or y += when accumulate != 0; x (c1-c0+1) x k, y (r1-r0+1) x k, column-major. */
QXESM_API SmStatus qxsmmultv(SmMatrix* a, const double* x, double* y, int64_t r0, int64_t r1, int64_t c0, int64_t c1,
                             int64_t k, int32_t accumulate);
/* y <- A' x, or y += when accumulate != 0; x rows x k, y cols x k. */
QXESM_API SmStatus qxsmvmult(const double* x, SmMatrix* a, double* y, int64_t k, int32_t accumulate);
/* r <- X A X', packed lower by rows, for p vectors of length c1-c0+1. */
QXESM_API SmStatus qxsmquadv(SmMatrix* a, const double* x, double* r, int64_t p, int64_t c0, int64_t c1);
/* r <- X' A Y, p x q. */
QXESM_API SmStatus qxsmbilin(SmMatrix* a, const double* x, const double* y, double* r, int64_t p, int64_t q);
/* R <- X A X'. */
QXESM_API SmStatus qxsmquad(SmMatrix* a, SmMatrix* x, SmMatrix* r, int32_t keep);
/* R <- G S G', s packed lower by rows. */
QXESM_API SmStatus qxsmDenseQuad(SmMatrix* g, const double* s, SmMatrix* r, int32_t keep);
/* r <- X A^- X', packed; format 23 by upper rows, else by lower rows. */
QXESM_API SmStatus qxsminvquadv(SmMatrix* a, const double* x, double* r, int64_t p, int32_t format);
/* R <- X A^- X'. */
QXESM_API SmStatus qxsminvquad(SmMatrix* a, SmMatrix* x, SmMatrix* r);
/* r <- X' A^- Y, p x q. */
QXESM_API SmStatus qxsminvbilin(SmMatrix* a, const double* x, const double* y, double* r, int64_t p, int64_t q);
/* A <- s A. */
QXESM_API SmStatus qxsmmults(SmMatrix* a, double s);
/* C <- A B. */
QXESM_API SmStatus qxsmmultm(SmMatrix* a, SmMatrix* b, SmMatrix* c, int32_t keep);
/* C <- A + scale B for two closed matrices of one shape: qxsmconvert(A, C, 1), then qxsmAddGinv(C, B, null, 0, scale,
 * tolerance), which says what may be added to what and what the tolerance drops. C may be A: then B is added in place,
 * and only the checks of qxsmAddGinv are made.
 * A symmetric sparse C is left open when A is symmetric sparse too (close it to read it); filled from any other A it is
 * closed by the conversion, and adding answers 119.
 * Answers: 104 (C is B); 1 (any of kind none); 113 (A or B); 121 (A and B differ in shape); those of qxsmconvert; those
 * of qxsmAddGinv (0 with nothing added when A has no stored entries: C is then as empty as A); 0. After a refusal of
 * those two C holds what they leave. */
QXESM_API SmStatus qxsmvaxpy(SmMatrix* c, SmMatrix* a, SmMatrix* b, double scale, double tolerance);

#endif
