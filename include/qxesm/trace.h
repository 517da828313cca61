/* Traces. Every operation of this header answers 124 in this release. */
#ifndef QXESM_TRACE_H
#define QXESM_TRACE_H

#include <qxesm/instance.h>

/* *result <- trace of A. */
QXESM_API SmStatus qxsmtrace(SmMatrix* a, double* result);
/* *result <- trace of A B. */
QXESM_API SmStatus qxsmtraceAB(SmMatrix* a, SmMatrix* b, double* result);
/* *result <- sum over j = start .. n-1 of the diagonal of A^- B. */
QXESM_API SmStatus qxsmtraceinvAB(SmMatrix* a, SmMatrix* b, int64_t start, double* result);

#endif
