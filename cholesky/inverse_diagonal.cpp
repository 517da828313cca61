// The diagonal of the generalized inverse, from the factor and without forming the inverse: selected inversion
// (selected_inverse.cpp), or column by column where there is no memory for that (inverse_columns.cpp).
#include <algorithm>

#include "cholesky/packed_triangle.hpp"
#include "cholesky/selected_inverse.hpp"
#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

void sparse_diagonal(SmMatrix& m, double* x) {
  SelectedInverse inverse(m);
  if (inverse.compute(SelectedInverse::Wanted::diagonal) != SM_OK) {
    diagonal_by_columns(m, x);
    return;
  }
  for (i64 k = 0; k < m.rows; ++k) x[m.perm[k]] = inverse.diagonal(k);
}

SmStatus packed_diagonal(SmMatrix& m, double* x) {
  Scratch<double> work;
  SM_TRY(need_pool(m));
  SM_TRY(work.take(m.pool, m.rows));
  double* w = work.data();
  with_packed(m.format, m.rows, [&](auto layout) {
    const double* r = factor_array(m);
    for (i64 j = 0; j < m.rows; ++j) {
      if (!(r[layout.diagonal(j)] > 0.0)) continue;
      std::fill_n(w, j, 0.0);
      w[j] = 1.0;
      solve_upper(layout, r, w, j);
      for (i64 i = 0; i <= j; ++i) x[i] += w[i] * w[i];
    }
  });
  return SM_OK;
}

SmStatus symmetric_diagonal(SmMatrix& m, double* x) {
  if (m.format == SM_FORMAT_SPARSE) {
    SM_TRY(factor(m, false));
    sparse_diagonal(m, x);
    return SM_OK;
  }
  if (!is_dense_format(m.format)) return SM_UNAVAILABLE;
  if (m.state < SM_STATE_FACTORED) SM_TRY(factor(m, false));
  if (m.state < SM_STATE_INVERTED) return packed_diagonal(m, x);
  with_packed(m.format, m.rows, [&](auto layout) {
    for (i64 i = 0; i < m.rows; ++i) x[i] = factor_array(m)[layout.diagonal(i)];
  });
  return SM_OK;
}

Gate may_read_diagonal(const SmMatrix& m) {
  SM_STOP_WITH(may_read(m));
  SM_STOP_IF(m.rows != m.cols, SM_NOT_SQUARE);
  return {};
}

}  // namespace

SmStatus inverse_diagonal(SmMatrix& m, double* x) {
  SM_PASS(may_read_diagonal(m));
  std::fill_n(x, m.rows, 0.0);
  if (m.kind == SM_KIND_SYMMETRIC) return symmetric_diagonal(m, x);
  if (m.kind != SM_KIND_DIAGONAL) return SM_UNAVAILABLE;
  // What a diagonal matrix answers is its factored array as it stands, the square roots, until it has been inverted.
  if (m.state < SM_STATE_FACTORED) SM_TRY(factor(m, false));
  std::copy_n(factor_array(m), m.rows, x);
  return SM_OK;
}

}  // namespace sm
