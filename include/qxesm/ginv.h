/* Generalized inverses: pivots, estimability, accumulation, inversion. Every operation of this header answers 124 in
 * this release. */
#ifndef QXESM_GINV_H
#define QXESM_GINV_H

#include <qxesm/instance.h>

/* pivots[i] <- '1' when row i has an accepted pivot, else '0'; n characters, no terminating zero. */
QXESM_API SmStatus qxsmpivot(SmMatrix* matrix, char* pivots);
/* Counts and flags the vectors x that fail x = x A^- A (mode 'H': x = x H). */
QXESM_API SmStatus qxsmcke(SmMatrix* matrix, const double* vectors, int32_t k, int64_t* failed_count, int32_t* flags,
                           char mode, double tolerance);
/* A <- A + s B. */
QXESM_API SmStatus qxsmAddSS(SmMatrix* a, SmMatrix* b, double s);
/* G[r+i][r+j] <- s A[i][j] + B[c+i][c+j]. */
QXESM_API SmStatus qxsmUpdateGinv(SmMatrix* g, SmMatrix* a, SmMatrix* b, int64_t r, int64_t c, double s);
/* Adds s B into the trailing block of G from off on; p, when not null, gets the block's old contents. */
QXESM_API SmStatus qxsmAddGinv(SmMatrix* g, SmMatrix* b, SmMatrix* p, int64_t off, double s, double tolerance);
/* Replaces a packed or diagonal matrix by its generalized inverse, or keeps the inverse beside it. */
QXESM_API SmStatus qxsminv(SmMatrix* a, int16_t in_place, double tolerance);
/* H <- A^- A. */
QXESM_API SmStatus qxsmhermite(SmMatrix* a, SmMatrix* h);
/* Orthogonalises the flagged rows of a general sparse matrix; active has n flags. */
QXESM_API SmStatus qxsmorth(SmMatrix* a, int16_t* active, int64_t lo, int64_t hi, double tolerance);

#endif
