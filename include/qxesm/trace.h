/* Traces. Every operation stores the missing value in *result before it checks anything, so that a refused call leaves
 * it there. */
#ifndef QXESM_TRACE_H
#define QXESM_TRACE_H

#include <qxesm/instance.h>

/* *result <- trace of A: the sum of the first min(rows, cols) diagonal elements, in order; served in every state from 1
 * on. Answers: 100 (empty or kind none); 113; 110 (another kind); 124 (format); 0. */
QXESM_API SmStatus qxsmtrace(SmMatrix* a, double* result);

/* *result <- trace of A B, A r x c and B c x k: sum over i, j of A[i][j] B[j][i]; elements of A that would meet one
 * outside B (r > k) add nothing. The order of the sum is free.
 *
 *   A                   with B
 *   diagonal            any kind, through its diagonal
 *   symmetric 21        general, symmetric, diagonal
 *   symmetric 23        general, symmetric, diagonal
 *   symmetric 22        symmetric, diagonal; general: 124
 *   general             general; symmetric, diagonal: 124
 *
 * Answers: 100 (both empty, or either of kind none); 113; 121 (A's columns are not B's rows); 124 (kind or format); 101
 * (diagonal A: work of min(rows, cols) doubles from B's pool); 0.
 * 0 with *result missing, which a caller tells by looking at it: symmetric sparse A and B with B reordered (state > 2),
 * or without memory for n doubles of work. Cost: one pass over the stored elements of A, a search for each when B is
 * sparse; symmetric A in format 22 or 23 with B symmetric sparse: one pass over B. */
QXESM_API SmStatus qxsmtraceAB(SmMatrix* a, SmMatrix* b, double* result);

/* *result <- sum over j = start .. n-1 of element j of A^- b_j, b_j row j of B as qxsmrow(B, j, b_j, start) gives it.
 * For a symmetric B and start 0 that is the trace of A^- B. A is factored first when needed; B may be A only when that
 * leaves its rows readable.
 * Answers: 100 (both empty, or either of kind none); 113; 111 (A not square, or its order is not B's row count); 124 (A
 * neither symmetric nor diagonal, or inverted); those of qxsmfact; 101; then, *result the sum so far: 117 (start < 0),
 * those of qxsmrow (118 for a reordered symmetric sparse B) and qxsmsubst; 0 (0.0 when start >= n).
 * Cost: a row of B and a solve for each j. For a symmetric sparse A, start 0 and B diagonal, or symmetric in state 1 or
 * 2 with all its entries where the factor of A has some (as those of A are): that of qxsminvdiag, and a search for each
 * entry of B; when the memory for it cannot be had, solves. */
QXESM_API SmStatus qxsmtraceinvAB(SmMatrix* a, SmMatrix* b, int64_t start, double* result);

#endif
