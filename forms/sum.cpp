// C = A + s B for whole matrices.
#include "ginv/operations.hpp"
#include "store/operations.hpp"

namespace sm {

namespace {

Gate may_sum(const SmMatrix& c, const SmMatrix& a, const SmMatrix& b) {
  SM_STOP_IF(&c == &b, SM_BAD_ARGUMENT);
  SM_STOP_IF(a.kind == SM_KIND_NONE || b.kind == SM_KIND_NONE || c.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(!is_closed_or_empty(a) || !is_closed_or_empty(b), SM_NOT_CLOSED);
  SM_STOP_IF(a.rows != b.rows || a.cols != b.cols, SM_DIMENSION_MISMATCH);
  return {};
}

SmStatus sum(SmMatrix& c, SmMatrix& a, SmMatrix& b, double scale, double tolerance) {
  // In place, the addition's own checks are all there are.
  if (&c == &a) return add_ginv(a, b, nullptr, 0, scale, tolerance);
  SM_PASS(may_sum(c, a, b));
  SM_TRY(convert(a, c, true));  // reassembled, so that a symmetric sparse C is open for what is added
  return add_ginv(c, b, nullptr, 0, scale, tolerance);
}

}  // namespace

}  // namespace sm

extern "C" SmStatus qxsmvaxpy(SmMatrix* c, SmMatrix* a, SmMatrix* b, double scale, double tolerance) {
  return sm::sum(*c, *a, *b, scale, tolerance);
}
