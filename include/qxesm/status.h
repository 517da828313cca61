/* Status codes: what every operation of the module returns. */
#ifndef QXESM_STATUS_H
#define QXESM_STATUS_H

#include <stdint.h>

/* A 32-bit status. 0 is success; 1 means "untyped matrix, nothing done"; 100 and above are answers that the
 * caller has to look at. The same number means the same thing in every operation. */
typedef int32_t SmStatus;

enum {
  SM_OK = 0,                     /* done, or nothing to do (an operand with no stored entries) */
  SM_UNTYPED = 1,                /* the matrix is of kind none (new or reset); nothing done */
  SM_NOTHING_TO_REPORT = 100,    /* the matrix is empty, so there is no rank, log-determinant or trace;
                                 from qxsmGetANewInstance: the table or a block could not be allocated */
  SM_NO_MEMORY = 101,            /* a pool could not be created or an allocation failed */
  SM_WRONG_STATE = 102,          /* a factorization step or solve called before the step it builds on */
  SM_NOT_DEFINITE = 103,         /* a pivot below the negative limit: not positive semidefinite */
  SM_BAD_ARGUMENT = 104,         /* negative or out-of-range index, null data, output that is also an input */
  SM_TOO_LARGE = 105,            /* an element count above 2^53 or a byte count above 2^64 */
  SM_SYMBOLIC_FAILED = 106,      /* a row of the compressed matrix holds a column twice */
  SM_NOT_CONVERGED = 109,        /* the iterative solver reached its iteration limit */
  SM_KIND_MISMATCH = 110,        /* the operand's kind is not allowed here, or two kinds differ */
  SM_NOT_SQUARE = 111,           /* the matrix is not square */
  SM_NOT_SYMMETRIC_SPARSE = 112, /* ordering needs a symmetric sparse matrix */
  SM_NOT_CLOSED = 113,           /* the matrix has not been closed */
  SM_INVERTED = 114,             /* the matrix was replaced by its inverse and can no longer be factored */
  SM_BAD_FORMAT = 116,           /* the format is not allowed for this kind */
  SM_OUTSIDE = 117,              /* index outside the matrix, or below the diagonal of a symmetric one */
  SM_REORDERED = 118,            /* the stored order has been changed by ordering or factoring */
  SM_ALREADY_CLOSED = 119,       /* a closed symmetric sparse matrix takes no more entries */
  SM_NO_FACTOR = 120,            /* the separate factor or inverse array that is needed is missing */
  SM_DIMENSION_MISMATCH = 121,   /* operand dimensions do not agree */
  SM_BAD_SIZE = 122,             /* negative, or one dimension zero and the other not */
  SM_NO_ELEMENT = 123,           /* the stored form cannot answer this element request */
  SM_UNAVAILABLE = 124           /* the operation is not available for this kind or format */
};

#endif
