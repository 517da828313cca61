/* Products and forms.
 *
 * A block of k vectors is one array that holds them one after the other. A packed p x p result holds element (i, j),
 * i <= j, at j(j+1)/2 + i (the upper triangle by columns) unless its declaration says otherwise. Matrices are only
 * read, but for the result and, in the forms around an inverse, for the factor that A is given when it has none. A
 * result matrix that is also an operand is refused with 104 before it is touched. Work memory comes from the pool of
 * the first matrix and goes back before the call returns. */
#ifndef QXESM_FORMS_H
#define QXESM_FORMS_H

#include <qxesm/instance.h>

/* y <- A[r0..r1, c0..c1] x, or y <- y + ... when accumulate != 0. Ranges are inclusive and zero-based.
 *   x  in   (c1-c0+1) x k; component i stands for column c0 + i
 *   y  out  (r1-r0+1) x k; component i stands for row r0 + i; never the array x
 * Symmetric matrices are multiplied as if both triangles were stored. A diagonal matrix gives nothing when the column
 * range reaches past both ends of the row range (c0 < r0 and c1 > r1), although its diagonal crosses that block.
 * Answers: 0 with y untouched (empty); 1; 113; 104 (x is y; a range outside the matrix or reversed); then, with y
 * cleared unless it accumulates: 0 (k < 1); 124 (symmetric in format 22 and not the whole matrix); 118 (symmetric
 * sparse past state 1 and not the whole matrix); 0.
 * Infinities and NaNs in x and in stored entries propagate. Nothing is allocated. The order of a sum is free, but the
 * same on every CPU. Cost: one pass over the block for each vector; of a sparse matrix up to 8 vectors share a pass,
 * but not through a whole symmetric one whose entries lie far from the diagonal, nor through a sub-block of one. */
QXESM_API SmStatus qxsmmultv(SmMatrix* a, const double* x, double* y, int64_t r0, int64_t r1, int64_t c0, int64_t c1,
                             int64_t k, int32_t accumulate);

/* y <- A' x, or y <- y + A' x when accumulate != 0, for the whole matrix in any state from 1 on.
 *   x  in   rows x k          y  out  cols x k; never the array x
 * A general sparse matrix leaves out the rows that meet an exact zero of x; elsewhere everything propagates.
 * Answers: 0 with y untouched (empty); 1; 113; 104 (x is y); 0 (k < 1, with y cleared unless it accumulates); 0.
 * Nothing is allocated. Cost: that of qxsmmultv. */
QXESM_API SmStatus qxsmvmult(const double* x, SmMatrix* a, double* y, int64_t k, int32_t accumulate);

/* r <- X A[c0..c1, c0..c1] X', packed, for p vectors.
 *   x  in   (c1-c0+1) x p; component i of a vector stands for row and column c0 + i
 *   r  out  p(p+1)/2 doubles, all written
 * A may be of any kind. Of a general matrix, which need not be symmetric, element (i, j) is x_i' A x_j for i <= j.
 * Answers: 0 with r untouched (empty); 1; 113; 111; 121 (an end of the range outside the matrix, or c0 > c1); 0.
 * Nothing is allocated. Cost: p passes over the block and p^2 (c1-c0+1) / 2 additions (twice that for a triangle). */
QXESM_API SmStatus qxsmquadv(SmMatrix* a, const double* x, double* r, int64_t p, int64_t c0, int64_t c1);

/* r <- X' A Y for a symmetric or diagonal A of order n.
 *   x  in  n x p          y  in  n x q          r  out  p x q, element (i, j) at i + j*p; neither x nor y
 * Answers: 0 with r untouched (empty); 1; 113; 111; 104 (r is x or y); 124 (general; r is cleared); 0.
 * Nothing is allocated. Cost: p + q passes over the matrix and 2npq additions. */
QXESM_API SmStatus qxsmbilin(SmMatrix* a, const double* x, const double* y, double* r, int64_t p, int64_t q);

/* R <- X A X', or R <- R + X A X' when keep != 0.
 *   a     in      order n
 *   x     in      rows x n, closed; without entries it gives a form of zeros
 *   r     in/out  symmetric; keep 0: sized to X's rows first and closed at the end, dropping nothing; else used as it
 *                 is and left open
 *     X general in format 22, 23     by vectors, for any A: rows made contiguous (a copy of format 22 unless it has one
 *                                    row only), then qxsmquadv
 *     X general sparse, symmetric,   by rows, for a symmetric A. What X does not store counts as 0, and 0 times an
 *     diagonal                       infinity is a NaN
 * Elements with a magnitude above setting 3 of the instance are added by qxsmassign; a NaN is not. But a result in
 * format 22, when X is in format 22 or 23, is written as a whole, whatever keep says, and loses its factor, rank and
 * log-determinant.
 * Answers: 0 with R untouched (empty A); 1 (A); 113 (A or X); 104 (R is A or X); 121 (X's columns are not A's rows);
 * 110 (R not symmetric); then, R having been sized, 124 (pair not served); 118 (X symmetric sparse past state 2); 105;
 * 101; 111 (A, with X in format 22 or 23); 121 (written as a whole: R is not of the order of X's rows or has no array);
 * the answer of qxsmassign that ended it; that of qxsmclose; 0. The answer of sizing R is passed over, except that a
 * result that has no array for want of memory is told by 101 or 105.
 * Work: by vectors a packed form and the copy of X; by rows 2n doubles, and an index of a symmetric sparse X.
 * Cost: by vectors that of qxsmquadv; by rows a pass over A for each row of X, and each row once for each before it. */
QXESM_API SmStatus qxsmquad(SmMatrix* a, SmMatrix* x, SmMatrix* r, int32_t keep);

/* R <- G S G', or R <- R + G S G' when keep != 0.
 *   g     in      general sparse, rows x c, closed
 *   s     in      a packed symmetric array of order c, upper triangle by columns
 *   r     in/out  symmetric sparse; keep as in qxsmquad
 * Every element (i, j), i <= j, of two rows with entries is added by qxsmassign, zeros included.
 * Answers: 0 with R untouched (G is dense or diagonal and not empty); 113; 104 (R is G); with keep 0 that of
 * qxsmresize unless it is 0; 0 (G without entries; with keep 0, R is closed); 124 (G or R of another kind or format);
 * 105; 101; the answer of qxsmassign that ended it; that of qxsmclose; 0.
 * Work: c doubles. Cost: c operations for each entry of G, and each row of G once for each row before it. */
QXESM_API SmStatus qxsmDenseQuad(SmMatrix* g, const double* s, SmMatrix* r, int32_t keep);

/* r <- X A^- X', packed, for p vectors and a symmetric or diagonal A of order n. A is factored when it is not.
 *   x       in   n x p
 *   r       out  p(p+1)/2 doubles, never the array x; untouched unless the answer is 0
 *   format  23: element (i, j), i <= j, at i*p - i(i-1)/2 + j - i (the upper triangle by rows); else at j(j+1)/2 + i
 * Answers: 0 with r untouched (empty); 104 (r is x); 113; 120 (state 5 or 6 without a separate factor or inverse
 * array); 124 (general); 105; 101; those of qxsminvmultv (102 for an inverted matrix in format 22); 0.
 * Work: n * max(p, 1) doubles. Cost: p solves and p(p+1)/2 dot products. */
QXESM_API SmStatus qxsminvquadv(SmMatrix* a, const double* x, double* r, int64_t p, int32_t format);

/* R <- X A^- X' for a symmetric or diagonal A of order n, factored when it is not.
 *   x   in   rows x n, general, closed
 *   r   out  symmetric; sized to X's rows and closed at the end, dropping nothing
 * From a sparse X every element is stored, zeros included, and the solve is repeated for every pair of rows. From a
 * dense X there is one solve a row, and R in format 22 is written as a whole; in other formats elements with a
 * magnitude above setting 3 of the instance are entered.
 * Answers: 0 with R untouched (A or X empty); 1 (A); 113 (A or X); 120 (as in qxsminvquadv); 104 (R is A or X); 111;
 * 121 (X's columns are not A's rows); 110 (R not symmetric); that of qxsmresize unless it is 0; 124 (A general, or X
 * not); 105; 101; those of qxsminvmultv; of qxsmassign; of qxsmclose; 0.
 * Work: 3n doubles for a sparse X; for a dense one rows * n, a copy of X in format 22, and a packed result unless R is
 * in format 22. */
QXESM_API SmStatus qxsminvquad(SmMatrix* a, SmMatrix* x, SmMatrix* r);

/* r <- X' A^- Y for a symmetric or diagonal A of order n, factored when it is not.
 *   x  in  n x p          y  in  n x q          r  out  p x q, element (i, j) at i + j*p; neither x nor y
 * A diagonal A is not solved with: the factor's elements f divide as 1/(f*f), a dropped one (f = 0) included, which
 * gives an infinity or a NaN; an inverse (state 6) multiplies.
 * Answers: 0 with r untouched (empty); 1; 113; 120 (as in qxsminvquadv); 104 (r is x or y); 111; then, with r
 * cleared: 124 (general); 105; 101; those of qxsminvmultv (symmetric) or qxsmfact (diagonal); 0.
 * Work: n * max(q, 1) doubles for a symmetric A. Cost: q solves and pq dot products. */
QXESM_API SmStatus qxsminvbilin(SmMatrix* a, const double* x, const double* y, double* r, int64_t p, int64_t q);

/* A <- s A, stored entry by stored entry. Rank and state stay. For s > 0 a known log-determinant grows by
 * rank * log(s). What becomes of a factor or inverse:
 *   symmetric sparse, state 5      positive reciprocal pivots are divided by s, whatever its sign
 *   separate array (dense or       s > 0: it becomes the factor or inverse of s A. s <= 0 or NaN: it is left as it was,
 *   diagonal), state 5 or 6        with the log-determinant, and no longer belongs to A
 *   in place of the values         multiplied by s like any values, and no longer the factor or inverse of s A
 * Answers: 0 with nothing done (empty); 1; 113; 124; 0. Nothing is allocated. Cost: one pass. */
QXESM_API SmStatus qxsmmults(SmMatrix* a, double s);

/* C <- A B, or C <- C + A B when keep != 0.
 *   a  in      rows x n, closed          b  in  n x cols, closed; may be the same matrix as a
 *   c  in/out  of any kind, neither a nor b; keep 0: sized to rows x cols first. It is left open: close it to read it.
 *   A \ B                 general   symmetric   diagonal
 *   general 21, 22, 23    yes       no          yes
 *   symmetric 21, 23      yes       yes         yes
 *   symmetric 22          no        yes         yes
 *   diagonal              yes       yes         yes
 * Elements are added by qxsmassign, in sparse rows of B product by product, else row by row. Elements for which C has
 * no place are passed over: a symmetric C takes the upper triangle, a diagonal C the diagonal. Of a general C in format
 * 22 or 23 the position counts, as in qxsmassign: a kept one should have the product's size. Of two diagonal matrices
 * the product's diagonal is written into a diagonal C, which loses its factor, rank and log-determinant; any other C
 * gets it by qxsmassign, zeros included, and is closed with keep 0.
 * Answers: 0 with nothing done (A and B empty); 1 (A); 113 (A or B); 104 (C is A or B); 121 (A's columns are not B's
 * rows; C diagonal and neither A nor B); then, C having been sized, 124 (pair not served); 0 (A or B empty); 101; 121
 * (diagonal times diagonal into a diagonal C of another order); the answer of qxsmassign that ended it, 104 and 117
 * aside; 0. The answer of sizing C is passed over, except that a C that has no array for want of memory is told by
 * 101 or 105.
 * Work: cols doubles when B's rows are full; an index of its entries for each symmetric sparse operand. Cost: one
 * assignment for each product of two entries, or for each element where B's rows are full. */
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
