// Forms around the inverse of a symmetric or diagonal matrix: solves, then dot products. The inverse is never formed.
//
//   X A^- X'   X general 21            one solve for every pair of rows
//              X general 22, 23        one solve for every row
//              X symmetric, diagonal   124
#include "cholesky/steps.hpp"
#include "forms/kernels.hpp"
#include "forms/operations.hpp"
#include "forms/results.hpp"
#include "forms/rows.hpp"

namespace sm {

namespace {

bool is_invertible_kind(const SmMatrix& a) { return a.kind == SM_KIND_SYMMETRIC || a.kind == SM_KIND_DIAGONAL; }

// A factor or inverse in place of the values leaves no separate array, and the solves ask for one.
bool lacks_factor(const SmMatrix& a) { return a.state >= SM_STATE_FACTORED && !a.row_start; }

// A factored sparse matrix without rows is told by the missing factor, not as an open one.
bool is_open(const SmMatrix& a) { return !is_closed(a) && !lacks_factor(a); }

Gate may_form_vectors(const SmMatrix& a, const double* x, const double* r) {
  SM_STOP_IF(a.nnz < 1, SM_OK);
  SM_STOP_IF(x == r, SM_BAD_ARGUMENT);
  SM_STOP_IF(is_open(a), SM_NOT_CLOSED);
  SM_STOP_IF(lacks_factor(a), SM_NO_FACTOR);
  SM_STOP_IF(!is_invertible_kind(a), SM_UNAVAILABLE);
  return {};
}

Gate may_form_matrix(const SmMatrix& a, const SmMatrix& x, const SmMatrix& r) {
  SM_STOP_IF(a.nnz < 1 || x.nnz < 1, SM_OK);
  SM_STOP_IF(a.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(is_open(a) || !is_closed(x), SM_NOT_CLOSED);
  SM_STOP_IF(lacks_factor(a), SM_NO_FACTOR);
  SM_STOP_IF(&r == &a || &r == &x, SM_BAD_ARGUMENT);
  SM_STOP_IF(a.rows != a.cols, SM_NOT_SQUARE);
  SM_STOP_IF(x.cols != a.rows, SM_DIMENSION_MISMATCH);
  SM_STOP_IF(r.kind != SM_KIND_SYMMETRIC, SM_KIND_MISMATCH);
  return {};
}

Gate may_form_bilinear(const SmMatrix& a, const double* x, const double* y, const double* r) {
  SM_STOP_IF(a.nnz < 1, SM_OK);
  SM_STOP_IF(a.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(is_open(a), SM_NOT_CLOSED);
  SM_STOP_IF(lacks_factor(a), SM_NO_FACTOR);
  SM_STOP_IF(x == r || y == r, SM_BAD_ARGUMENT);
  SM_STOP_IF(a.rows != a.cols, SM_NOT_SQUARE);
  return {};
}

// W <- A^- X for `count` vectors. The solve clears one vector even when there are none, so W holds at least one.
SmStatus solve(SmMatrix& a, const double* x, i64 count, Scratch<double>& w) {
  i64 words = 0;
  count = std::max<i64>(count, 0);
  SM_TRY(array_size(std::max<i64>(count, 1), a.rows, words));
  SM_TRY(need_pool(a));
  SM_TRY(w.take(a.pool, words));
  return apply_inverse(a, x, w.data(), count);
}

// The solve is repeated for every pair, which costs time and needs room for three vectors only, however many rows X
// has.
template <class Rows>
SmStatus enter_pairs(SmMatrix& a, Rows& rows, i64 count, double* xi, double* xj, double* w, SmMatrix& r) {
  for (i64 i = 0; i < count; ++i) {
    scatter_row(rows, i, xi, a.rows);
    for (i64 j = i; j < count; ++j) {
      if (j > i) scatter_row(rows, j, xj, a.rows);
      SM_TRY(apply_inverse(a, j > i ? xj : xi, w, 1));
      SM_TRY(assign(r, i, j, false, hzvdot11(xi, w, a.rows)));
    }
  }
  return SM_OK;
}

SmStatus form_by_pairs(SmMatrix& a, SmMatrix& x, SmMatrix& r) {
  Scratch<double> xi;
  Scratch<double> xj;
  Scratch<double> w;
  SM_TRY(xi.take(a.pool, a.rows));
  SM_TRY(xj.take(a.pool, a.rows));
  SM_TRY(w.take(a.pool, a.rows));
  CompleteRows<TreeRows> rows{TreeRows(x)};
  return enter_pairs(a, rows, x.rows, xi.data(), xj.data(), w.data(), r);
}

SmStatus form_by_vectors(SmMatrix& a, SmMatrix& x, SmMatrix& r) {
  ContiguousRows rows;
  SM_TRY(rows.take(a.pool, x));
  if (r.format == SM_FORMAT_COLUMNS) {
    double* values = nullptr;
    SM_TRY(claim_values(r, x.rows, values));
    return inverse_form_of_vectors(a, rows.data(), values, x.rows, r.format);
  }
  Scratch<double> packed;
  i64 count = 0;
  SM_TRY(packed_size(x.rows, count));
  SM_TRY(packed.take(a.pool, count));
  SM_TRY(inverse_form_of_vectors(a, rows.data(), packed.data(), x.rows, SM_FORMAT_COLUMNS));
  return enter_packed(packed.data(), x.rows, entry_tolerance(a), r);
}

// A factor of a diagonal matrix holds square roots, 0 for a dropped element, and divides unguarded; an inverse holds
// reciprocals. Both asymmetries with the solves are part of the interface.
void diagonal_forms(const SmMatrix& a, const double* x, const double* y, double* r, i64 p, i64 q) {
  const double* f = a.dense_factor;
  const bool is_root = a.state == SM_STATE_FACTORED;
  for (i64 b = 0; b < q; ++b, y += a.rows) {
    const double* xa = x;
    for (i64 k = 0; k < p; ++k, xa += a.rows) {
      double sum = 0.0;
      for (i64 i = 0; i < a.rows; ++i) sum += is_root ? xa[i] * y[i] / (f[i] * f[i]) : xa[i] * y[i] * f[i];
      r[k + b * p] = sum;
    }
  }
}

SmStatus symmetric_forms(SmMatrix& a, const double* x, const double* y, double* r, i64 p, i64 q) {
  Scratch<double> w;
  SM_TRY(solve(a, y, q, w));
  for (i64 b = 0; b < q; ++b) {
    for (i64 k = 0; k < p; ++k) r[k + b * p] = hzvdot11(x + k * a.rows, w.data() + b * a.rows, a.rows);
  }
  return SM_OK;
}

}  // namespace

SmStatus inverse_form_of_vectors(SmMatrix& a, const double* x, double* r, i64 p, std::int32_t format) {
  SM_PASS(may_form_vectors(a, x, r));
  Scratch<double> w;
  SM_TRY(solve(a, x, p, w));
  with_packed(format, p, [&](auto layout) {
    for (i64 i = 0; i < p; ++i) {
      for (i64 j = i; j < p; ++j) r[layout.at(i, j)] = hzvdot11(x + i * a.rows, w.data() + j * a.rows, a.rows);
    }
  });
  return SM_OK;
}

SmStatus inverse_form_of_matrix(SmMatrix& a, SmMatrix& x, SmMatrix& r) {
  SM_PASS(may_form_matrix(a, x, r));
  SM_TRY(resize(r, x.rows, x.rows));
  if (!is_invertible_kind(a) || x.kind != SM_KIND_GENERAL) return SM_UNAVAILABLE;
  SM_TRY(need_pool(a));
  SM_TRY(is_general_dense(x) ? form_by_vectors(a, x, r) : form_by_pairs(a, x, r));
  return close(r, missing());
}

SmStatus inverse_bilinear_form(SmMatrix& a, const double* x, const double* y, double* r, i64 p, i64 q) {
  SM_PASS(may_form_bilinear(a, x, y, r));
  if (p > 0 && q > 0) std::fill_n(r, p * q, 0.0);
  if (a.kind == SM_KIND_SYMMETRIC) return symmetric_forms(a, x, y, r, p, q);
  if (a.kind != SM_KIND_DIAGONAL) return SM_UNAVAILABLE;
  if (a.state < SM_STATE_FACTORED) SM_TRY(factor(a, false));
  diagonal_forms(a, x, y, r, p, q);
  return SM_OK;
}

}  // namespace sm
