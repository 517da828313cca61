// Which rows have an accepted pivot, and which vectors lie in the row space.
#include <algorithm>
#include <cmath>

#include "cholesky/steps.hpp"
#include "forms/kernels.hpp"
#include "ginv/operations.hpp"
#include "store/checks.hpp"
#include "store/views.hpp"

namespace sm {

namespace {

Gate may_ask_pivots(const SmMatrix& m) {
  SM_STOP_IF(m.nnz < 1, SM_OK);
  SM_STOP_IF(m.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(m.state < SM_STATE_FACTORED && !is_closed(m), SM_NOT_CLOSED);
  SM_STOP_IF(m.rows != m.cols, SM_NOT_SQUARE);
  return {};
}

void flag(char* out, i64 row, double pivot) {
  if (pivot > 0.0) out[row] = '1';
}

Gate may_check(const SmMatrix& m) {
  SM_STOP_IF(m.nnz < 1, SM_OK);
  SM_STOP_IF(m.kind == SM_KIND_NONE || !is_closed(m) || m.rows != m.cols, SM_NOT_CLOSED);
  return {};
}

// A NaN on either side fails.
bool agrees(const double* x, const double* z, i64 n, double tolerance) {
  const double bound = tolerance * zvamx(x, n);
  for (i64 i = 0; i < n; ++i) {
    if (!(std::fabs(x[i] - z[i]) <= bound)) return false;
  }
  return true;
}

// Runs product(x, z) for every vector and takes those off the count of failures whose product comes back as x. Answers
// the status of the last product.
template <class Product>
SmStatus check_each(const SmMatrix& m, const double* vectors, std::int32_t k, i64& failed, std::int32_t* flags,
                    double tolerance, double* z, Product&& product) {
  SmStatus status = SM_OK;
  for (i64 v = 0; v < k; ++v) {
    const double* x = vectors + v * m.rows;
    status = product(x, z);
    if (status != SM_OK || !agrees(x, z, m.rows, tolerance)) continue;
    --failed;
    if (flags) flags[v] = 0;
  }
  return status;
}

SmStatus times_hermite(SmMatrix& m, const double* x, double* z) {
  const TreeRows h(m);
  std::fill_n(z, m.rows, 0.0);
  for (i64 j = 0; j < m.rows; ++j) {
    if (x[j] == 0.0) continue;
    h.row(j, [&](i64 c, double v) { z[c] += x[j] * v; });
  }
  return SM_OK;
}

}  // namespace

SmStatus pivots(SmMatrix& m, char* out) {
  SM_PASS(may_ask_pivots(m));
  const bool has_pivots = m.kind == SM_KIND_SYMMETRIC || m.kind == SM_KIND_DIAGONAL;
  if (has_pivots && m.state < SM_STATE_FACTORED) {
    SM_TRY(factor(m, false));
  } else if (is_symmetric_sparse(m) && !m.row_start) {
    return SM_NO_FACTOR;
  }
  std::fill_n(out, m.rows, '0');
  if (!has_pivots) return SM_UNAVAILABLE;
  if (m.kind == SM_KIND_DIAGONAL) {
    for (i64 i = 0; i < m.rows; ++i) flag(out, i, m.values[i]);
  } else if (m.format == SM_FORMAT_SPARSE) {
    for (i64 k = 0; k < m.rows; ++k) flag(out, m.perm[k], m.factor_diag[k]);
  } else if (is_dense_format(m.format)) {
    with_packed(m.format, m.rows, [&](auto layout) {
      for (i64 i = 0; i < m.rows; ++i) flag(out, i, factor_array(m)[layout.diagonal(i)]);
    });
  }
  return SM_OK;
}

SmStatus check_estimable(SmMatrix& m, const double* vectors, std::int32_t k, i64& failed, std::int32_t* flags,
                         char mode, double tolerance) {
  failed = k;
  if (flags && k > 0) std::fill_n(flags, k, 1);
  SM_PASS(may_check(m));
  if (k < 1) return SM_OK;
  SM_TRY(need_pool(m));
  Scratch<double> product;
  SM_TRY(product.take(m.pool, m.rows, Fill::zero));
  double* z = product.data();
  if (mode == 'H') {
    if (!is_general_sparse(m)) return SM_OK;  // nothing is checked, nothing passes
    return check_each(m, vectors, k, failed, flags, tolerance, z,
                      [&](const double* x, double* out) { return times_hermite(m, x, out); });
  }
  if (m.kind != SM_KIND_SYMMETRIC) return SM_OK;
  Scratch<double> solution;
  SM_TRY(solution.take(m.pool, m.rows));
  double* w = solution.data();
  return check_each(m, vectors, k, failed, flags, tolerance, z, [&](const double* x, double* out) {
    SM_TRY(apply_inverse(m, x, w, 1));
    return qxsmmultv(&m, w, out, 0, m.rows - 1, 0, m.rows - 1, 1, 0);
  });
}

}  // namespace sm
