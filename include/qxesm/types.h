/* Kinds, storage formats and lifecycle states of a matrix, and the numeric constants that callers meet. */
#ifndef QXESM_TYPES_H
#define QXESM_TYPES_H

#include <stdint.h>

/* Structure kind (SmMatrix.kind). */
enum {
  SM_KIND_NONE = 1,      /* freshly created or reset: almost every operation answers 1 or 0 */
  SM_KIND_GENERAL = 2,   /* rows x cols */
  SM_KIND_SYMMETRIC = 3, /* square; only the upper triangle (col >= row) is stored */
  SM_KIND_DIAGONAL = 6   /* square; only the diagonal is stored */
};

/* Storage format (SmMatrix.format). Element (r, c), zero-based, n = rows:
 *
 *   format  general                     symmetric (r <= c)                           diagonal
 *   21      one tree of nonzeros a row  trees while open, compressed rows afterwards not allowed (116)
 *   22      by columns, r + c*rows      upper by columns, r + c(c+1)/2               n values
 *   23      by rows,    c + r*cols      upper by rows, ((2n - r + 1)*r)/2 - r + c    n values */
enum { SM_FORMAT_NONE = 1, SM_FORMAT_SPARSE = 21, SM_FORMAT_COLUMNS = 22, SM_FORMAT_ROWS = 23 };

/* Lifecycle state (SmMatrix.state). */
enum {
  SM_STATE_OPEN = 0,      /* a symmetric sparse matrix that is taking entries */
  SM_STATE_CLOSED = 1,    /* storage final; readable by every operation */
  SM_STATE_ORDERED = 2,   /* a fill-reducing ordering is present */
  SM_STATE_REORDERED = 3, /* the ordering has been applied to the stored rows */
  SM_STATE_SYMBOLIC = 4,  /* the structure of the factor is present, or values changed since factoring */
  SM_STATE_FACTORED = 5,  /* the numeric factor is present */
  SM_STATE_INVERTED = 6   /* the values (or the separate array) are the generalized inverse */
};

/* The missing value: a NaN with these bits, stored where a result is unknown. Compare bits, or use isnan. */
#define SM_MISSING_BITS UINT64_C(0xFFFFFE0000000000)

/* Bits of the default tolerances: settings 0 to 2 (1.110223024625157e-12) and setting 3 (1.491668147e-154). */
#define SM_TOLERANCE_BITS UINT64_C(0x3D73880000000002)
#define SM_DROP_TOLERANCE_BITS UINT64_C(0x20000000002302AC)

/* 2^53: no array of the module holds more elements. */
#define SM_MAX_ELEMENTS INT64_C(9007199254740992)

/* Every public symbol of the module. */
#if defined(__cplusplus)
#define QXESM_API extern "C" __attribute__((visibility("default")))
#else
#define QXESM_API extern __attribute__((visibility("default")))
#endif

#endif
