/* Ordering, factorization A = U'DU with dropped pivots, and direct solves.
 *
 * A pivot d is accepted when d > |a| * t, a the diagonal element of A and t the instance's setting 2
 * (1.11e-12); it ends the factorization with 103 when d < -0.1 (|a| * t < 0.1) or d < -100 * |a| * t; anything in
 * between, a NaN included, is dropped. A dropped pivot takes its row and column out, so the factor is that of a
 * generalized inverse; rank and log-determinant count accepted pivots only. */
#ifndef QXESM_CHOLESKY_H
#define QXESM_CHOLESKY_H

#include <qxesm/instance.h>

/* Minimum-degree ordering of a closed symmetric sparse matrix: fills perm and inv_perm, sizes work; state 2.
 * Answers: 0 with nothing done (empty); 1; 112 (not symmetric sparse); 0 (ordered already); 102 (not closed);
 * 105 (workspace); 101 (the state stays 1); 0. */
QXESM_API SmStatus qxsmmd(SmMatrix* matrix);

/* An ordering of the caller's in place of qxsmmd: fills perm and inv_perm, sizes work; state 2.
 *   perm  in  n words: perm[k] is the row placed k-th, 0-based; copied
 * Any fill-reducing ordering serves; nested dissection often halves the work on three-dimensional grids.
 * Answers: 0 with nothing done (empty); 1; 112 (not symmetric sparse); 0 (ordered already); 102 (not closed);
 * 104 (perm is null or no permutation; the state stays 1); 101; 105 (workspace); 0. A repeated row is found only once
 * there is memory to look. Cost: O(n). */
QXESM_API SmStatus qxsmorder(SmMatrix* matrix, const int64_t* perm);

/* Applies the ordering to the stored rows in place: entry (i, j) moves to the row of whichever index comes first in the
 * new order, the diagonal first in its row; state 3. qxsmget serves the diagonal only afterwards.
 * Answers: 0 with nothing done (empty); 0 (applied already); 1; 102 (state other than 2, or not symmetric sparse);
 * 0. Cost: O(nnz), nothing allocated. */
QXESM_API SmStatus qxsmreorder(SmMatrix* matrix);

/* Structure of U, in compressed subscripts: factor_iju, factor_iu, factor_ju, and room for the values; state 4.
 * Answers: 0 with nothing done (empty); 0 (state 4); 1; 113; 0 (state 5 and above); 102 (state other than 3);
 * 106 (a row holds a column twice; the state stays 3); 105; 101; 0. */
QXESM_API SmStatus qxsmsymbfact(SmMatrix* matrix);

/* Values of U and D in the room that qxsmsymbfact left; state 5; rank, log_det, definite. Allocates nothing, and takes
 * 430 kB of stack. Uses the widest vector instructions of the CPU, chosen when the module is loaded: the last bits
 * depend on them.
 * Answers: 0 with nothing done (empty); 0 (state 5); 1; 113; 0 (state above 5); 102 (state other than 4, or not
 * symmetric sparse); 101 (the room is too small); 103 (definite 0, the state stays 4); 0. */
QXESM_API SmStatus qxsmnumfact(SmMatrix* matrix);

/* New values for the pattern that is there, for repeated fits; ordering and structure stay. State 5 becomes 4, the
 * others stay; rank and log-determinant are void, definite unknown.
 *   values  in  nnz values in closing order: the upper triangle row by row, columns ascending, the diagonal first (the
 *               order of nz_values as closing left them, whatever happened to the matrix since)
 * Answers: 0 with nothing done (empty); 1; 112 (not symmetric sparse); 113; 104 (values is null or overlaps nz_values);
 * 101 (nothing is changed); 0. Cost: O(nnz). The first call on a reordered matrix finds where the values go,
 * keeps that (nnz words) and needs 2 nnz + n words more while it does; later calls allocate nothing. */
QXESM_API SmStatus qxsmrefill(SmMatrix* matrix, const double* values);

/* Factors whatever has a factor; state 5.
 *   symmetric sparse      the four steps above, from where the matrix stands
 *   symmetric 22, 23      packed triangular R with R'R = A, in the layout of the format; a dropped pivot has r_kk = 0
 *                         and zeros in the rest of its row
 *   diagonal              square roots; d > t accepted (an absolute test), d < -0.0001 ends with 103, else 0
 *   in_place  only its low 16 bits count. 0: dense and diagonal matrices factor a copy (dense_factor) and keep their
 *             values; else the values are overwritten, and a separate array goes back first
 * Answers: 0 with nothing done (empty; factored already); 1; 114 (inverted); 113; the first answer of a step that
 * is not 0; 101; 103 (definite 0; a packed array is untouched, a diagonal one transformed up to the bad element); 124;
 * 0. */
QXESM_API SmStatus qxsmfact(SmMatrix* matrix, int32_t in_place);

/* *out <- log of the product of the accepted pivots; factors first when needed. *out is the missing value on every
 * answer but 0. Answers: 100 (empty or kind none); 113; 111; 124 (not symmetric or diagonal); qxsmfact's; 0. */
QXESM_API SmStatus qxsmlogdet(SmMatrix* matrix, double* out);

/* *out <- number of accepted pivots; factors first when needed. *out is 0 on every answer but 0.
 * Answers: 100 (empty or kind none); 113; 124 (not symmetric or diagonal); qxsmfact's; 0. */
QXESM_API SmStatus qxsmrank(SmMatrix* matrix, int64_t* out);

/* x <- A^- b for `count` right-hand sides, with the factor that is there (state 5).
 *   b  in   n x count, column-major          x  out  the same shape; never the array b
 * x holds at least n doubles, also when count < 1: a symmetric matrix clears that many first.
 * Dropped pivots: sparse and diagonal give 0 there. A packed factor passes the component on undivided, so that
 * A x = b for every b in the range of A; for other b the result belongs to another generalized inverse than the one
 * that inversion stores.
 * Answers: 0 with nothing done (empty); 1; 113; 102 (state other than 5); 104 (x is b); 124; 101 (a packed matrix needs
 * n doubles of work, whatever the count); 0. Cost: two passes over the factor for each right-hand side.
 * Uses the record's factor_scratch: one solve at a time for each matrix. */
QXESM_API SmStatus qxsmsubst(SmMatrix* matrix, const double* b, double* x, int32_t count);

/* x <- A^- b, factoring when needed; an inverse that is there (state 6) is multiplied by. Shapes as in qxsmsubst; all
 * n * count elements of x are cleared first; the solves use the low 32 bits of count.
 * Answers: 0 with nothing done (empty); 1; 113; 120 (state 5 or 6 without a separate factor or inverse array);
 * 104 (x is b); 111; 124 (general); qxsmfact's; qxsmsubst's (102 for an inverted matrix in format 22); 0. */
QXESM_API SmStatus qxsminvmultv(SmMatrix* matrix, const double* b, double* x, int64_t count);

/* The one-call solve: closes an open matrix (dropping nothing), factors or inverts it, x <- A^- b.
 *   symmetric sparse   qxsmfact and qxsmsubst
 *   symmetric 22, 23   replaces the factor, or the matrix, by its generalized inverse (in the separate array when there
 *                      is one, else in the values): state 6; then x <- G b
 *   diagonal           divides by the stored values; d <= t gives 0; d < -0.0001 ends with 103
 * Shapes as in qxsmsubst. Answers: 0 with nothing done (empty); 1; 104 (x is b); qxsmclose's; 124 (general);
 * 101; 103; qxsmfact's; qxsmsubst's; 0. */
QXESM_API SmStatus qxsmsoldirect(SmMatrix* matrix, const double* b, double* x, int32_t count);

/* x <- the diagonal of A^-, factoring when needed; n doubles, in the matrix's own numbering. Rows of dropped pivots
 * give 0. A diagonal matrix that has not been inverted answers its factor, the square roots of its elements, as it
 * stands.
 * Answers: 0 with nothing done (empty); 1; 113; 111; then, with x cleared: 124 (general); qxsmfact's; 101 (packed: n
 * doubles of work); 0. Cost of a sparse matrix: that of factoring its values, up to three times, with as many doubles
 * as U has, n more and up to 13.6 MB while it runs; where that memory cannot be had, n partial back substitutions
 * without any. Uses the record's factor_scratch. */
QXESM_API SmStatus qxsminvdiag(SmMatrix* matrix, double* x);

/* values <- the elements of A^- where A has stored entries, factoring when needed: prediction error variances and
 * covariances of effects that the model correlates.
 *   values  out  nnz doubles in closing order: the upper triangle row by row, columns ascending (as qxsmrefill takes
 *                them); untouched on every answer but 0
 * Rows and columns of dropped pivots give 0.
 * Answers: 0 with nothing done (empty); 1; 113; 111; 124 (not symmetric sparse); 104 (values is null or overlaps
 * nz_values); qxsmfact's; 101; 0. Cost and memory: those of qxsminvdiag, and nnz doubles. The first call for a pattern
 * finds the closing order and keeps it, as qxsmrefill does. Uses the record's factor_scratch. */
QXESM_API SmStatus qxsminvpattern(SmMatrix* matrix, double* values);

#endif
