// The factorization driver, and what it reports.
#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

Gate may_factor(const SmMatrix& m) {
  SM_STOP_IF(m.nnz < 1, SM_OK);
  SM_STOP_IF(m.state == SM_STATE_FACTORED, SM_OK);
  SM_STOP_IF(m.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(m.state == SM_STATE_INVERTED, SM_INVERTED);
  SM_STOP_IF(!is_closed(m), SM_NOT_CLOSED);
  return {};
}

SmStatus factor_sparse(SmMatrix& m) {
  if (m.state < SM_STATE_ORDERED) SM_TRY(order(m));
  if (m.state < SM_STATE_REORDERED) SM_TRY(reorder(m));
  if (m.state < SM_STATE_SYMBOLIC) SM_TRY(factor_symbolic(m));
  return factor_numeric(m);
}

// Only matrices that have a pivot sequence report on it.
Gate may_report(const SmMatrix& m, bool wants_square) {
  SM_STOP_IF(m.nnz < 1 || m.kind == SM_KIND_NONE, SM_NOTHING_TO_REPORT);
  SM_STOP_IF(!is_closed(m), SM_NOT_CLOSED);
  SM_STOP_IF(wants_square && m.rows != m.cols, SM_NOT_SQUARE);
  SM_STOP_IF(m.kind != SM_KIND_SYMMETRIC && m.kind != SM_KIND_DIAGONAL, SM_UNAVAILABLE);
  return {};
}

}  // namespace

SmStatus factor(SmMatrix& m, bool in_place) {
  SM_PASS(may_factor(m));
  if (is_symmetric_sparse(m)) return factor_sparse(m);
  if (m.kind == SM_KIND_SYMMETRIC) return factor_packed(m, in_place);
  if (m.kind == SM_KIND_DIAGONAL) return factor_diagonal(m, in_place);
  return SM_UNAVAILABLE;
}

SmStatus log_determinant(SmMatrix& m, double& out) {
  out = missing();
  SM_PASS(may_report(m, true));
  if (m.state < SM_STATE_FACTORED) SM_TRY(factor(m, false));
  out = m.log_det;
  return SM_OK;
}

SmStatus rank(SmMatrix& m, i64& out) {
  out = 0;
  SM_PASS(may_report(m, false));
  if (m.state < SM_STATE_FACTORED) SM_TRY(factor(m, false));
  out = m.rank;
  return SM_OK;
}

}  // namespace sm
