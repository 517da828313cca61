// The generalized inverse at the stored positions of a matrix.
#include "cholesky/reorder.hpp"
#include "cholesky/selected_inverse.hpp"
#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

Gate may_read_inverse(const SmMatrix& m) {
  SM_STOP_WITH(may_read(m));
  SM_STOP_IF(m.rows != m.cols, SM_NOT_SQUARE);
  SM_STOP_IF(!is_symmetric_sparse(m), SM_UNAVAILABLE);
  return {};
}

}  // namespace

// Every stored entry is on the pattern of the factor.
SmStatus inverse_on_pattern(SmMatrix& m, double* values) {
  SM_PASS(may_read_inverse(m));
  if (!values || overlaps_nz_values(m, values)) return SM_BAD_ARGUMENT;
  SM_TRY(factor(m, false));
  SM_TRY(need_closing_places(m));
  SelectedInverse inverse(m);
  SM_TRY(inverse.compute());
  for (i64 k = 0; k < m.rows; ++k) {  // rows of A lie in rows of U
    const i64 i = m.perm[k];
    for (i64 p = m.row_start[i]; p < m.row_start[i + 1]; ++p) {
      values[m.factor_reserved[p]] = inverse.at(SelectedInverse::place(m, i, m.col_index[p]));
    }
  }
  return SM_OK;
}

}  // namespace sm
