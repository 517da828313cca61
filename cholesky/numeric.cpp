// Numeric factorization of a symmetric sparse matrix: the values of U and D. This file has the checks and the results,
// numeric.hpp the pivots; numeric_blocked.cpp does the work, numeric_rows.cpp is the plain road.
#include "cholesky/numeric.hpp"

#include "store/checks.hpp"

namespace sm {

namespace {

Gate may_factor(const SmMatrix& m) {
  SM_STOP_IF(m.nnz < 1, SM_OK);
  SM_STOP_IF(m.state == SM_STATE_FACTORED, SM_OK);
  SM_STOP_IF(m.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(!is_closed(m), SM_NOT_CLOSED);
  SM_STOP_IF(m.state > SM_STATE_FACTORED, SM_OK);
  SM_STOP_IF(m.state != SM_STATE_SYMBOLIC || !is_symmetric_sparse(m) || !m.work, SM_WRONG_STATE);
  return {};
}

using Road = SmStatus (*)(const NumericArrays&, Pivots&);

SmStatus factor_numeric_by(SmMatrix& m, Road road) {
  SM_PASS(may_factor(m));
  const i64 n = m.rows;
  const i64 integers = 3 * n + 2 + m.work[n - 1];
  const i64 value_word = (integers + m.factor_block - 1) / m.factor_block;
  m.definite = 1;
  if (m.work_capacity - (value_word + 2 * n) < m.work[2 * n]) return SM_NO_MEMORY;
  const NumericArrays arrays(m, value_word);
  Pivots pivots(m, singularity_tolerance(m));
  if (const SmStatus status = road(arrays, pivots); status != SM_OK) {
    m.definite = 0;
    return status;
  }
  m.factor_scratch = arrays.position;
  m.factor_diag = arrays.diag;
  m.factor_values = arrays.values;
  m.rank = pivots.rank();
  m.log_det = pivots.log_sum();
  m.state = SM_STATE_FACTORED;
  return SM_OK;
}

}  // namespace

SmStatus factor_numeric(SmMatrix& m) { return factor_numeric_by(m, factor_in_blocks); }

SmStatus factor_numeric_by_rows(SmMatrix& m) { return factor_numeric_by(m, factor_by_rows); }

}  // namespace sm
