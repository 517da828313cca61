// New values for the pattern that a symmetric sparse matrix has, without assembling it again.
#include <algorithm>

#include "cholesky/reorder.hpp"
#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

Gate may_refill(const SmMatrix& m) {
  SM_STOP_IF(m.nnz < 1, SM_OK);
  SM_STOP_IF(m.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(!is_symmetric_sparse(m), SM_NOT_SYMMETRIC_SPARSE);
  SM_STOP_IF(!is_closed(m), SM_NOT_CLOSED);
  return {};
}

}  // namespace

SmStatus refill(SmMatrix& m, const double* values) {
  SM_PASS(may_refill(m));
  if (!values || overlaps_nz_values(m, values)) return SM_BAD_ARGUMENT;
  if (m.state < SM_STATE_REORDERED) {
    std::copy_n(values, m.nnz, m.nz_values);
  } else {
    SM_TRY(need_closing_places(m));
    // In the order of the rows as they are: what few rows of the caller have for them is read in as many streams.
    for (i64 p = 0; p < m.nnz; ++p) m.nz_values[p] = values[m.factor_reserved[p]];
  }
  if (m.state == SM_STATE_FACTORED) m.state = SM_STATE_SYMBOLIC;
  m.definite = -1;
  void_results(m);
  return SM_OK;
}

}  // namespace sm
