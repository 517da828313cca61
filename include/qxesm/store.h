/* The matrix store: creation, sizing, assembly, closing, reading, copying. */
#ifndef QXESM_STORE_H
#define QXESM_STORE_H

#include <qxesm/instance.h>

/* A record of the given kind and format, without a size.
 *   matrix  in/out  *matrix null: a new record, registered in the instance; else that record is typed again, and what
 *                   it held before is not given back (reset it with qxsmdelete first)
 * Answers: 104 (the record is another instance's); 101 (record, registry or pool could not be had); 116 (format not
 * allowed for the kind: 21, 22, 23 for general and symmetric, 22, 23 for diagonal); 124 (no such kind); 0.
 * On 116 and 124 the record stays registered with kind none and without a pool, and *matrix is unchanged. A missing
 * tree manager is not an error here: the first assignment answers 101. */
QXESM_API SmStatus qxsmnew(SmInstance* instance, SmMatrix** matrix, int32_t kind, int32_t format);

/* qxsmnew and qxsmresize in one: symmetric sparse n x n, open, with its zero diagonal; symmetric in format 22, n x n;
 * general sparse rows x cols; diagonal in format 23, n x n. The answer of qxsmnew unless it is 0, else of
 * qxsmresize. */
QXESM_API SmStatus qxsmnewss(SmInstance* instance, SmMatrix** matrix, int64_t n);
QXESM_API SmStatus qxsmnewds(SmInstance* instance, SmMatrix** matrix, int64_t n);
QXESM_API SmStatus qxsmnewsg(SmInstance* instance, SmMatrix** matrix, int64_t rows, int64_t cols);
QXESM_API SmStatus qxsmnewsd(SmInstance* instance, SmMatrix** matrix, int64_t n);

/* Gives the matrix a size, drops its entries and factor, and voids rank and log-determinant.
 *   dense and diagonal  zero values, state 1; the same size again zeroes the array in place (a tied one too); another
 *                       size gives an owned array back, lets go of a tied one, and takes a new one
 *   general sparse      no entries, state 1
 *   symmetric sparse    a zero on every diagonal position (nnz = n), state 0: open for qxsmassign
 * 0 x 0 is a size. Answers: 1; 122 (negative, or exactly one dimension zero); 111 (symmetric or diagonal and
 * rows != cols; the state is 1 afterwards, and while a symmetric sparse matrix has no compressed rows its readers
 * answer 113); 105 (more than 2^53 values, roots or nodes, but a diagonal matrix answers 101); 101; 124.
 * After 105 or 101 a dense or diagonal matrix has no values (nnz 0) and keeps rows and cols as asked; a sparse one
 * keeps its size and refuses entries with 101. 111 takes a matrix that was factored or inverted in place to state 1 as
 * well, with that factor or inverse as its values. Cost: the size of the storage; a symmetric sparse matrix pays n
 * insertions. */
QXESM_API SmStatus qxsmresize(SmMatrix* matrix, int64_t rows, int64_t cols);

/* Resets to kind none, state 0: pools, trees and arrays go back; the record and its registry index stay, so that
 * qxsmnew or qxsmtie can use it again. Null is harmless. Answers 0. */
QXESM_API SmStatus qxsmdelete(SmMatrix* matrix);

/* Resets the matrix, frees its record, in the instance that made it, and stores null. A null address or record is
 * harmless. Answers 0. */
QXESM_API SmStatus qxsmDestroyMatrix(SmInstance* instance, SmMatrix** matrix);

/* Attaches the caller's array as the values of a dense or diagonal matrix.
 *   data  in/out, lent  rows*cols (general), n(n+1)/2 (symmetric) or n (diagonal) doubles in the layout of the format;
 *                       it stays the caller's and must outlive its use; the module never frees it
 * What the matrix held is dropped first. The state is 1 for a matrix that had a type (0 for one that was symmetric
 * sparse) and 0 for a reset record (1 if it was closed since), which is registered again: qxsmclose makes it readable.
 * Answers: 104 (data null with rows > 0 or cols >= 1; a negative size), with nothing changed; then, with the matrix
 * emptied: 111 (symmetric or diagonal, rows != cols); 124 (a format other than 22, 23; another kind); 105 (more than
 * 2^53 values); 0. */
QXESM_API SmStatus qxsmtie(SmMatrix* matrix, double* data, int64_t rows, int64_t cols, int32_t kind, int32_t format);

/* Removes one entry of a general sparse matrix; an absent entry is no error.
 * Answers: 0 with nothing done (empty); 1; 117 (outside); 124 (not general sparse); 0. */
QXESM_API SmStatus qxsmremove(SmMatrix* matrix, int64_t row, int64_t col);

/* Stores (add = 0) or adds (add != 0) one value.
 *   general sparse    an index past the size makes the matrix grow to cover it
 *   symmetric sparse  only while open, only col >= row; an index past the size makes the matrix grow to cover col; the
 *                     new rows get their zero diagonal when the matrix is closed
 *   dense             general: the position col + row*cols (format 23) or col*rows + row (format 22) is what counts
 * Rank and log-determinant are voided. On a factored or inverted dense or diagonal matrix the separate factor array
 * goes back and the state returns to 1; one that was factored or inverted in place keeps its state, and its values are
 * then that factor or inverse with this element changed.
 * Answers: 0 with nothing done (rows < 1); 1; 104 (negative index); 117 (below the diagonal of a symmetric matrix); 119
 * (symmetric sparse, closed); 104 (off the diagonal of a diagonal matrix; outside a dense matrix's storage or size);
 * 124 (format); 105 (2^53 entries, or an index that no root array can reach); 101; 0.
 * After 101 from a sparse matrix that could not get a new slab the entry is in; further calls answer 101.
 * Cost: one tree insertion. */
QXESM_API SmStatus qxsmassign(SmMatrix* matrix, int64_t row, int64_t col, int32_t add, double value);

/* Reads one element of a closed matrix into *value.
 *   symmetric sparse  col >= row only; once ordering has been applied or begun (state > 1) the diagonal only
 *   diagonal          the diagonal value of the row, whatever the column
 *   symmetric 22, 23  below the diagonal the position of the format leads to another element, which is what is read
 * Answers, with *value 0: 123 (empty); with *value missing: 110 (kind none); 113; 117 (outside); 123 (symmetric sparse,
 * below the diagonal, or off it past state 1; another kind); 116 (general, in a format that it does not know); else 0,
 * an absent entry reading as 0.
 * Cost: one search in the row. */
QXESM_API SmStatus qxsmget(SmMatrix* matrix, int64_t row, int64_t col, double* value);

/* Sets every stored entry of a closed matrix to `value`; the pattern stays. Rank and log-determinant are voided; a
 * symmetric sparse factor in state 5 becomes state 4; dense and diagonal factors as in qxsmassign.
 * Answers: 0 with nothing done (empty); 110 (kind none); 113; 124; 0. */
QXESM_API SmStatus qxsmsetee(SmMatrix* matrix, double value);

/* Adds weight * z * z' to a symmetric matrix.
 *   z      length doubles
 *   index  null: z lies along rows 0 .. length-1, and zeros of z add nothing; else length row numbers, in any order,
 *          and every pair is entered, zeros included
 * Answers: 0 with nothing done (empty); 104 (length > rows; z null with length > 0); 124 (not symmetric); 119 (sparse
 * and not open); else the first answer of qxsmassign that is not 0 (what was added before stays); 0.
 * Cost: length^2 / 2 assignments. */
QXESM_API SmStatus qxsmzscp(SmMatrix* matrix, const double* z, const int64_t* index, int64_t length, double weight);

/* Ends assembly: state 1. Entries with |value| <= tolerance are dropped (dense and diagonal: set to 0; the diagonal of
 * a symmetric sparse matrix: kept as 0). A negative tolerance stands for setting 3 of the instance; a NaN drops
 * nothing. A symmetric sparse matrix turns into compressed rows of its upper triangle, diagonal first, columns
 * ascending, every diagonal present; its trees go back to the host. Only a matrix in state 0 is touched.
 * Answers: 0 with state 1 (empty); 1; 0 with nothing done (closed already); 105; 101 (the matrix stays open);
 * 124; 0. Cost: one walk over the entries that drops, and for a symmetric sparse matrix one that converts. */
QXESM_API SmStatus qxsmclose(SmMatrix* matrix, double tolerance);

/* out <- row `row` of A from column `start` on (a negative start is 0).
 *   out  out  cols doubles, cleared first; absent entries are 0
 *   symmetric   what lies left of the diagonal, columns start .. row-1, is read from the earlier rows; what lies right
 *               of it is written whatever the start is, and so is the diagonal, but in format 22 from start <= row only
 *   diagonal    the diagonal element is written whatever the start is
 * A start > 0 moves the block of columns start .. cols-1 (general, format 23) or start .. row (symmetric, format 22) to
 * the beginning of out: column c is at out[c - start]. Every other layout keeps column c at out[c].
 * Answers: 0 with nothing done (empty); 1; 113; 117 (row outside); then, out cleared: 118 (symmetric sparse, reordered:
 * state > 2); 124; 0. Cost: the row; a search in each earlier row from `start` on for a symmetric sparse matrix. */
QXESM_API SmStatus qxsmrow(SmMatrix* matrix, int64_t row, double* out, int64_t start);

/* out <- the stored part of row `row` of a symmetric matrix in format 21 or 23: columns row .. n-1, at their own
 * places.
 *   out  out  n doubles, cleared first
 * Answers: 0 with nothing done (empty); 1; 113; then, out cleared: 124 (not symmetric); 118 (sparse, state > 2);
 * 124 (format 22); 117 (row outside); 0. */
QXESM_API SmStatus qxsmUpperRow(SmMatrix* matrix, int64_t row, double* out);

/* out <- rows r0 .. r1, columns c0 .. c1 of a symmetric sparse matrix, row-major; ranges are inclusive, r0 <= c0.
 *   out  out  (r1-r0+1) x (c1-c0+1) doubles, cleared before any check (an empty range clears nothing)
 * Each stored entry (i, j), i <= j, in the block is written at its place, and when c0 <= i < j also at
 * (j - c0) * (c1-c0+1) + (i - r0), as far as that is inside out. With r0 == c0 these are the places below the diagonal,
 * so a block on the diagonal is full; with r0 < c0 they are other ones, and an entry that shares its place with a later
 * one (rows ascending, columns ascending within) is lost.
 * Answers, out cleared: 0 (empty); 1; 113; 124 (not symmetric sparse); 118 (state > 2); 117 (an index outside
 * 0 .. n-1, r0 > r1, c0 > c1, c0 < r0); 0. */
QXESM_API SmStatus qxsmUpperSub(SmMatrix* matrix, double* out, int64_t r0, int64_t r1, int64_t c0, int64_t c1);

/* out <- diagonal elements first .. last, indices below min(rows, cols); served in every state from 1 on.
 *   out  out  last - first + 1 doubles
 * Answers: 0 with nothing done (empty); 1; 113; 117 (an index outside, last < first); then, out cleared: 124; 0. */
QXESM_API SmStatus qxsmdiag(SmMatrix* matrix, double* out, int64_t first, int64_t last);

/* out <- the whole matrix; served in every state from 1 on.
 *   mode  2: rows x cols, row-major, both triangles of a symmetric matrix
 *         0, 1: a symmetric matrix packed as in format 22 and as in format 23; the n values of a diagonal matrix
 *   out   out  rows*cols doubles for mode 2, else n(n+1)/2 (n for a diagonal matrix, rows*cols for a general one)
 * Answers: 0 with nothing done (empty); 1; 113; 105 (more than 2^53 elements); then, out cleared: 124 (a general matrix
 * in another mode than 2; another mode); 0. */
QXESM_API SmStatus qxsmdense(SmMatrix* matrix, double* out, int16_t mode);

/* *flag <- 1 when no stored off-diagonal element of a square matrix has |value| > tolerance (NaN: 0.0), else 0.
 * Elements that are NaN count as small. Answers, with *flag 0: 0 (empty); for a diagonal matrix 0 with *flag 1, open or
 * closed; 110 (kind none); 113; 121 (rows != cols); else 0. Cost: the entries up to the first large one. */
QXESM_API SmStatus qxsmIsDiag(SmMatrix* matrix, int16_t* flag, double tolerance);

/* target <- source, of the same kind and format. The target, typed with qxsmnew, is sized first; it takes the user word
 * too. The two share no array.
 *   symmetric sparse  reassemble 0: rows, ordering and factor as they are, with state, rank, log_det and definite, so
 *                     that a factored matrix is factored in the copy; else the entries are assigned to the open target,
 *                     in the caller's order whatever the source's: state 0, and more can be added
 *   general sparse    the entries; state 1
 *   dense, diagonal   the values; state 1, no factor
 * The same record twice answers 0 and nothing happens.
 * Answers: 1 (source of kind none); 113; those of qxsmresize (1 for a target of kind none); 0 (source empty: the target
 * is empty too; a symmetric sparse one takes its state unless reassemble is set); 110 (kind or format differ; the
 * target is sized); 101 (the target keeps what was entered, a symmetric sparse one its zero diagonal, open); 0.
 * Cost: the size of the storage; one insertion for each entry that goes into trees. */
QXESM_API SmStatus qxsmclone(SmMatrix* source, SmMatrix* target, int32_t reassemble);

/* target <- source, across kinds and formats. The target, typed with qxsmnew, is sized first.
 *   from general into general, from symmetric into general (both triangles) and symmetric, from diagonal into all
 *   three; in any formats. The same kind and format: qxsmclone(source, target, flag).
 * Every stored value of the source is entered, zeros included. A symmetric sparse source may be ordered or factored. A
 * symmetric sparse target is closed with tolerance 0.0, every other target is closed by its sizing; no factor is
 * copied. The same record twice answers 0 and nothing happens.
 * Answers: 1 (source of kind none); 113; those of qxsmresize (1 for a target of kind none, 111 for a symmetric or
 * diagonal one and a source that is not square); 124 (no such pair; the target is sized); the first of qxsmassign that
 * is not 0; those of qxsmclose; 0. Cost: one assignment for each stored value. */
QXESM_API SmStatus qxsmconvert(SmMatrix* source, SmMatrix* target, int32_t flag);

/* values -> the value array of a dense or diagonal matrix. When kind, format, rows or cols differ, or there are no
 * values because a sizing failed, the matrix is first emptied, typed again in its instance (its pools go back; the
 * record stays) and sized: state 1.
 *   values  in   rows*cols (general), n(n+1)/2 (symmetric) or n (diagonal) doubles in the layout of the format
 * Without that, the state stays and rank and log-determinant are voided: a separate factor or inverse array that is
 * there stays too and belongs to the old values. The values may then lie in the matrix's own arrays, and overlap those
 * that they replace.
 * Answers: 0 with nothing done (values null); 124 (format 21); 104 (values begins in an array of the matrix, be it the
 * values, a factor or an inverse, that would be given back); then, unless the shape fits: 1 (the matrix is of kind
 * none), those of qxsmnew (101, 116, 124: the record is left with kind none), those of qxsmresize (the matrix is left
 * with what that leaves); 0. Cost: one copy. */
QXESM_API SmStatus qxsmcopyv(const double* values, SmMatrix* matrix, int64_t rows, int64_t cols, int32_t kind,
                             int32_t format);

#endif
