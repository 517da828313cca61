// Forms of a matrix around another one, entered into a symmetric result.
//
//   X A X'                  X general 22, 23   X general 21   X symmetric, diagonal
//   A symmetric             by vectors         by rows        by rows (a reordered sparse X: 118)
//   A general, diagonal     by vectors         124            124
//
//   G S G'                  G general 21, S a packed array, the result symmetric 21; else 124
#include "forms/lines.hpp"
#include "forms/passes.hpp"
#include "forms/results.hpp"
#include "forms/rows.hpp"

namespace sm {

namespace {

Gate may_form(const SmMatrix& a, const SmMatrix& x, const SmMatrix& r) {
  SM_STOP_WITH(may_read(a));
  SM_STOP_IF(!is_closed_or_empty(x), SM_NOT_CLOSED);
  SM_STOP_IF(&r == &a || &r == &x, SM_BAD_ARGUMENT);
  SM_STOP_IF(x.cols != a.rows, SM_DIMENSION_MISMATCH);
  SM_STOP_IF(r.kind != SM_KIND_SYMMETRIC, SM_KIND_MISMATCH);
  return {};
}

// The packed form of a dense X is what a result in format 22 holds; it is copied there as it is.
SmStatus store_packed(const double* packed, i64 n, double tolerance, SmMatrix& r) {
  if (r.format != SM_FORMAT_COLUMNS) return enter_packed(packed, n, tolerance, r);
  double* values = nullptr;
  SM_TRY(claim_values(r, n, values));
  std::copy_n(packed, n * (n + 1) / 2, values);
  return SM_OK;
}

SmStatus form_by_vectors(SmMatrix& a, SmMatrix& x, SmMatrix& r) {
  ContiguousRows rows;
  Scratch<double> packed;
  i64 count = 0;
  if (x.nnz > 0) SM_TRY(rows.take(a.pool, x));
  SM_TRY(packed_size(x.rows, count));
  SM_TRY(packed.take(a.pool, count, Fill::zero));
  if (x.nnz > 0) SM_TRY(form_of_vectors(a, rows.data(), packed.data(), x.rows, {0, a.rows - 1}));
  return store_packed(packed.data(), x.rows, entry_tolerance(a), r);
}

// Whether zeros of X that are not stored make no difference to a product with w: they do where they meet an infinity
// or a NaN.
bool is_finite(const double* w, i64 n) {
  return std::all_of(w, w + n, [](double v) { return std::isfinite(v); });
}

// Row j of X times w; `dense` is n doubles of work for the case that every element counts.
template <class Rows>
double row_times(Rows& rows, i64 j, const double* w, i64 n, bool finite, double* dense) {
  double sum = 0.0;
  if (finite) {
    rows.row(j, [&](i64 k, double v) { sum += v * w[k]; });
    return sum;
  }
  scatter_row(rows, j, dense, n);
  for (i64 k = 0; k < n; ++k) sum += dense[k] * w[k];
  return sum;
}

// w <- A x.
template <class View>
void form_product(const View& a, const double* x, double* w) {
  std::fill_n(w, a.rows, 0.0);
  add_product(a, x, w);
}
void form_product(const UpperRows& a, const double* x, double* w) { passes().multiply(a, x, w, false); }

// Row i of X meets A once; the rows from i on then meet the product.
template <class Rows, class View>
SmStatus enter_forms(Rows& rows, const View& view, i64 count, double* x, double* w, double tolerance, SmMatrix& r) {
  for (i64 i = 0; i < count; ++i) {
    if (!scatter_row(rows, i, x, view.rows)) continue;
    form_product(view, x, w);
    const bool finite = is_finite(w, view.rows);
    for (i64 j = i; j < count; ++j) {
      const double sum = row_times(rows, j, w, view.rows, finite, x);
      if (std::fabs(sum) > tolerance) SM_TRY(assign(r, i, j, true, sum));
    }
  }
  return SM_OK;
}

SmStatus form_by_rows(SmMatrix& a, SmMatrix& x, SmMatrix& r) {
  if (a.kind != SM_KIND_SYMMETRIC) return SM_UNAVAILABLE;
  if (x.nnz < 1) return SM_OK;
  if (is_symmetric_sparse(x) && x.state >= SM_STATE_REORDERED) return SM_REORDERED;
  Scratch<double> row;
  Scratch<double> product;
  SM_TRY(row.take(a.pool, a.rows));
  SM_TRY(product.take(a.pool, a.rows));
  return with_rows(x, a.pool, [&](auto& rows) {
    return visit(a, [&]<class View>(const View& view) -> SmStatus {
      if constexpr (View::one_triangle) {
        return enter_forms(rows, view, x.rows, row.data(), product.data(), entry_tolerance(a), r);
      } else {
        return SM_UNAVAILABLE;
      }
    });
  });
}

// Stored values of a G that has a value array. Such a G is silently passed over, before anything else is looked at.
double dense_values(const SmMatrix& g) { return g.format == SM_FORMAT_SPARSE ? 0.0 : g.value_count; }

// w += g times row k of the packed array s, all n elements of it.
void add_symmetric_row(const Packed<PackedColumns>& s, i64 k, double g, double* w) {
  lane_add(w, s.find(0, k), k + 1, g);
  for (i64 j = k + 1; j < s.cols; ++j) w[j] += *s.find(k, j) * g;
}

SmStatus enter_around_array(SmMatrix& g, const Packed<PackedColumns>& s, double* w, SmMatrix& r) {
  const TreeRows rows(g);
  for (i64 i = 0; i < g.rows; ++i) {
    if (!first_node(g, i)) continue;
    std::fill_n(w, g.cols, 0.0);
    rows.row(i, [&](i64 k, double v) { add_symmetric_row(s, k, v, w); });
    for (i64 l = i; l < g.rows; ++l) {
      if (!first_node(g, l)) continue;
      double sum = 0.0;
      rows.row(l, [&](i64 k, double v) { sum += v * w[k]; });
      SM_TRY(assign(r, i, l, true, sum));
    }
  }
  return SM_OK;
}

SmStatus fill_around_array(SmMatrix& g, const double* s, SmMatrix& r) {
  if (g.nnz < 1) return SM_OK;
  if (!is_general_sparse(g) || !is_symmetric_sparse(r)) return SM_UNAVAILABLE;
  Scratch<double> work;
  SM_TRY(work.take(g.pool, g.cols));
  // The view serves writers too; here it only reads.
  return enter_around_array(g, {const_cast<double*>(s), g.cols}, work.data(), r);
}

}  // namespace

SmStatus form_of_matrix(SmMatrix& a, SmMatrix& x, SmMatrix& r, bool keep) {
  SM_PASS(may_form(a, x, r));
  const SmStatus sized = keep ? SM_OK : resize(r, x.rows, x.rows);
  SM_TRY(need_pool(a));
  SM_TRY(or_why_unsized(is_general_dense(x) ? form_by_vectors(a, x, r) : form_by_rows(a, x, r), sized));
  return keep ? SM_OK : close(r, missing());
}

SmStatus form_around_array(SmMatrix& g, const double* s, SmMatrix& r, bool keep) {
  if (!(dense_values(g) == 0.0)) return SM_OK;
  if (!is_closed_or_empty(g)) return SM_NOT_CLOSED;
  if (&g == &r) return SM_BAD_ARGUMENT;
  if (!keep) SM_TRY(resize(r, g.rows, g.rows));
  SM_TRY(fill_around_array(g, s, r));
  return keep ? SM_OK : close(r, missing());
}

}  // namespace sm
