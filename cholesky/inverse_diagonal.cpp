// The diagonal of the generalized inverse, from the factor and without forming the inverse.
//
// With A^- = V D^- V', V = U^-1: element i of the diagonal is the sum over columns j of V[i][j]^2 / D[j]. Each column
// of V D^(-1/2) is a back substitution that starts at row j.
#include <algorithm>
#include <cmath>

#include "cholesky/packed_triangle.hpp"
#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

// Row i of -U times w, up to column last; the columns of a row ascend.
double row_product(const SmMatrix& m, const double* w, i64 i, i64 last) {
  const i64* column = m.factor_ju + m.factor_iju[i] - m.factor_iu[i];
  double sum = 0.0;
  for (i64 p = m.factor_iu[i]; p < m.factor_iu[i + 1] && column[p] <= last; ++p) {
    sum += m.factor_values[p] * w[column[p]];
  }
  return sum;
}

void sparse_diagonal(const SmMatrix& m, double* x) {
  double* w = reinterpret_cast<double*>(m.factor_scratch);
  for (i64 j = m.rows - 1; j >= 0; --j) {
    if (!(m.factor_diag[j] > 0.0)) continue;
    std::fill_n(w, j + 1, 0.0);
    w[j] = std::sqrt(m.factor_diag[j]);
    x[m.perm[j]] += m.factor_diag[j];
    for (i64 i = j - 1; i >= 0; --i) {
      if (!(m.factor_diag[i] > 0.0)) continue;
      w[i] = row_product(m, w, i, j);
      x[m.perm[i]] += w[i] * w[i];
    }
  }
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
