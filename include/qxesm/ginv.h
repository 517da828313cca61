/* Generalized inverses: pivots, estimability, accumulation, block updates, inversion, Hermite form. */
#ifndef QXESM_GINV_H
#define QXESM_GINV_H

#include <qxesm/instance.h>

/* pivots[i] <- '1' when row i of a symmetric or diagonal matrix has a positive pivot, else '0'; factors first when
 * needed.
 *   pivots  out  n characters, no terminating zero
 * Rows are numbered as the caller numbers them, whatever the order of factoring. A diagonal matrix is judged by its
 * values; a packed one by the diagonal of its factor (or inverse).
 * Answers: 0 with nothing done (empty); 1; 113; 111; qxsmfact's; 120 (factored sparse without rows); then, with '0' in
 * every place: 124 (general); 0. */
QXESM_API SmStatus qxsmpivot(SmMatrix* matrix, char* pivots);

/* Counts and flags the vectors x that fail x = A A^- x (symmetric A) or, in mode 'H', x = x H (H general sparse): the
 * linear functions that are not estimable.
 *   vectors       in   k vectors of n, one after the other
 *   failed_count  out  vectors that did not pass
 *   flags         out  k flags, 1 failed, or null
 *   tolerance     every |x_i - z_i| must be at most this times the largest |x_i|; a NaN in the comparison fails
 * failed_count = k and all flags 1 come first, before any check, and stay when nothing can be checked (another kind).
 * Answers: 0 (empty); 113 (kind none, not closed, not square); 0 (k < 1); 101; in mode 'H' 0; else the status of the
 * last solve or product. Cost: a solve and a product for each vector. */
QXESM_API SmStatus qxsmcke(SmMatrix* matrix, const double* vectors, int32_t k, int64_t* failed_count, int32_t* flags,
                           char mode, double tolerance);

/* A <- A + s B.
 *   general       both general sparse; A grows to cover B
 *   diagonal      B's elements onto A's first ones
 *   symmetric 21  A open; an open B is closed first, dropping nothing; A open and B the same matrix doubles it in place
 *   symmetric 22, 23  B of the same format; values are added in storage order, never re-mapped: the leading block of a
 *                 larger A in format 22
 * A changed packed or diagonal A loses its separate factor array (state 1), rank and log-determinant.
 * Answers: 0 with nothing done (s is 0); 124 (kind of A, or a diagonal A with another B); 121 (A smaller than B, unless
 * general); 119 (A sparse and closed); 110 (kinds or formats that do not pair); 104 (an operand without its values);
 * general: the first answer of qxsmassign that is not 0; symmetric sparse: the last one; 0. */
QXESM_API SmStatus qxsmAddSS(SmMatrix* a, SmMatrix* b, double s);

/* G[r+i][r+j] <- s A[i][j] + B[c+i][c+j] over the stored triangle of G, i and j below the order of A. Nothing is
 * created.
 *   format 21  B sparse too; A and B are read as qxsmget reads them, what it stores for an element it cannot give
 *              included; a NaN s adds A unscaled
 *   format 23  A and B too; the columns end at A's order, which is right for r = 0, and A's values are used in storage
 *              order, one for each element written; a NaN s drops A
 *   format 22  A and B too; likewise, for the whole block
 * Positions outside G or B are skipped and use up no value of A. State 5 becomes 4, a separate factor or inverse array
 * goes back (an inverted G is then in state 1), rank and log-determinant are voided.
 * Answers: 0 with nothing done (G empty); 113 (G); 104 (G is A or B); 110 (not all symmetric); 124 (formats); 0. */
QXESM_API SmStatus qxsmUpdateGinv(SmMatrix* g, SmMatrix* a, SmMatrix* b, int64_t r, int64_t c, double s);

/* Adds s B into the trailing block of G that starts at (off, off).
 *   general    both general sparse; p is not written
 *   diagonal   B diagonal; p gets the block's old elements at (i, i)
 *   symmetric  B symmetric or diagonal, of the order of the block; G sparse must be open; p is resized to the block's
 *              order and gets its old upper triangle
 *   p          out  a matrix, or null
 *   tolerance  above 0: stored entries of the block at or below it become 0 at the end; NaN: setting 3
 * A changed packed or diagonal G loses its separate factor array (state 1), rank and log-determinant.
 * Answers: 0 with nothing done (G empty); 104 (two of the handles are the same); 124 (kind of G); then
 *   general    124 (G or B not general sparse); 104 (off negative)
 *   diagonal   124 (kind of B); 104 (off negative, or the block outside G)
 *   symmetric  104 (off negative); 121 (B's order is not that of the block); 124 (kind of B); 119 (G sparse, closed);
 *              113 (B), all before p is touched
 * the first answer of qxsmresize or qxsmassign that is not 0; 0. */
QXESM_API SmStatus qxsmAddGinv(SmMatrix* g, SmMatrix* b, SmMatrix* p, int64_t off, double s, double tolerance);

/* Replaces a packed or diagonal matrix by its generalized inverse (in_place 1), or keeps the inverse beside the values
 * (0); state 6. Rank, log-determinant and definiteness are recorded unless a factor was there already.
 *   tolerance  singularity tolerance; NaN: setting 2. Diagonal elements at or above it are inverted (an absolute test),
 *              below -0.0001 they end the call with 103, and are 0 in between
 * Called again in state 6, in_place 1 makes a kept inverse the values. A tied value array is let go, never freed.
 * Answers: 0 with nothing done (empty); 1; 113; 120 (state 5 or 6 in place, and in_place 0); 111; 124 (sparse,
 * general); 101; 103 (a packed array is untouched; a diagonal one inverted up to the bad element, rank 0,
 * log-determinant missing); 0. */
QXESM_API SmStatus qxsminv(SmMatrix* a, int16_t in_place, double tolerance);

/* H <- A^- A; H is resized to n x n.
 *   A symmetric 22, 23  H general; A is inverted beside its values (state 6); H stays as qxsmmultm leaves it
 *   A symmetric sparse  H general; A is factored; elements of magnitude 1.11e-12 or less are not stored
 *   A diagonal          H general or diagonal; A is inverted beside its values
 * Answers: 0 with nothing done (empty); 1; 113; 104 (H is A); 111; 110 (kind of H); 124 (kind of A); 123 (a diagonal A
 * could not be inverted); 101 and 105 (H lacks elements for want of memory); those of qxsminv, qxsmmultm, qxsmfact,
 * qxsmsubst; 0. Other answers of sizing H and of entering its elements are passed over.
 * Cost, sparse: a solve and a pass over A for each column. */
QXESM_API SmStatus qxsmhermite(SmMatrix* a, SmMatrix* h);

/* Orthogonalises rows of a general sparse square matrix against each other: each active row outside [lo, hi) is taken
 * out of the active ones and, when its squared length is above the tolerance, its component is removed from every row
 * that is still active and has one above the tolerance.
 *   active  in/out  n flags
 * A rewritten row keeps only its components below setting 0 in magnitude.
 * Answers: 0 with nothing done (empty); 1; 113; 111; 124 (not general sparse); 101; 0. */
QXESM_API SmStatus qxsmorth(SmMatrix* a, int16_t* active, int64_t lo, int64_t hi, double tolerance);

#endif
