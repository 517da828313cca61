// The C boundary of the traces.
#include "trace/operations.hpp"

extern "C" SmStatus qxsmtrace(SmMatrix* a, double* result) { return sm::trace(*a, *result); }

extern "C" SmStatus qxsmtraceAB(SmMatrix* a, SmMatrix* b, double* result) {
  return sm::trace_of_product(*a, *b, *result);
}

extern "C" SmStatus qxsmtraceinvAB(SmMatrix* a, SmMatrix* b, int64_t start, double* result) {
  return sm::trace_of_inverse_product(*a, *b, start, *result);
}
