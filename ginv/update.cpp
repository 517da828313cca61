// Rewriting a diagonal block of a symmetric matrix: G[r+i][r+j] <- s A[i][j] + B[c+i][c+j].
#include <algorithm>
#include <cmath>

#include "ginv/operations.hpp"
#include "store/checks.hpp"
#include "store/operations.hpp"
#include "store/views.hpp"

namespace sm {

namespace {

// The rows of a block of order `order` at offset `first` that lie in a matrix of order n. Where there are any, first is
// above -order, so that differences to it do not overflow.
struct BlockRows {
  i64 begin, end;
  BlockRows(i64 first, i64 order, i64 n) : begin(std::max<i64>(first, 0)), end(0) {
    i64 behind = 0;
    end = __builtin_add_overflow(first, order, &behind) ? n : std::min(behind, n);
  }
};

// What qxsmget stores for an element that it cannot give is what enters G: its statuses are not looked at.
double element(SmMatrix& m, i64 i, i64 j) {
  double value = 0.0;
  (void)get(m, std::min(i, j), std::max(i, j), value);
  return value;
}

double shifted_element(SmMatrix& m, i64 c, i64 t, i64 u) {
  i64 i = 0;
  i64 j = 0;
  const bool countable = !__builtin_add_overflow(c, t, &i) && !__builtin_add_overflow(c, u, &j);
  return countable ? element(m, i, j) : missing();
}

void update_sparse(SmMatrix& g, SmMatrix& a, SmMatrix& b, i64 r, i64 c, double s) {
  const UpperRows rows(g);
  const BlockRows block(r, a.rows, g.rows);
  for (i64 p = block.begin; p < block.end; ++p) {
    rows.row(p, [&](i64 q, double& v) {
      if (q < r || q - r >= a.rows) return;
      const double from_b = shifted_element(b, c, p - r, q - r);
      const double from_a = element(a, p - r, q - r);
      v = (std::isnan(s) ? from_a : from_a * s) + from_b;  // a NaN scale adds A as it is, here only
    });
  }
}

// Writes G's element (p, q), p <= q, and takes A's next value, unless the position lies outside G or B.
template <class Layout>
class PackedUpdate {
 public:
  PackedUpdate(SmMatrix& g, SmMatrix& a, SmMatrix& b, i64 r, i64 c, double s)
      : g_(g.values, g.rows),
        b_(b.values, b.values ? b.rows : 0),  // values that could not be had leave the order behind
        next_(a.values),
        end_(a.values + static_cast<i64>(a.value_count)),
        r_(r),
        c_(c),
        s_(s) {}

  void element(i64 p, i64 q) {
    i64 bp = 0;
    i64 bq = 0;
    if (q >= g_.rows || __builtin_add_overflow(c_, p - r_, &bp) || __builtin_add_overflow(c_, q - r_, &bq)) return;
    if (bp < 0 || bq >= b_.rows || next_ == end_) return;
    const double a = *next_++;
    const double b = *b_.find(bp, bq);
    *g_.find(p, q) = std::isnan(s_) ? b : s_ * a + b;  // a NaN scale drops A, here only
  }

 private:
  Packed<Layout> g_, b_;
  const double* next_;
  const double* end_;
  i64 r_, c_;
  double s_;
};

// Columns end at m and not at r + m: right for the leading block, and kept for every other one.
void update_by_rows(SmMatrix& g, SmMatrix& a, SmMatrix& b, i64 r, i64 c, double s) {
  PackedUpdate<PackedRows> update(g, a, b, r, c, s);
  const BlockRows block(r, a.rows, std::min(g.rows, a.rows));
  for (i64 p = block.begin; p < block.end; ++p) {
    for (i64 q = p; q < a.rows; ++q) update.element(p, q);
  }
}

void update_by_columns(SmMatrix& g, SmMatrix& a, SmMatrix& b, i64 r, i64 c, double s) {
  PackedUpdate<PackedColumns> update(g, a, b, r, c, s);
  const BlockRows block(r, a.rows, g.rows);
  for (i64 q = block.begin; q < block.end; ++q) {
    for (i64 p = block.begin; p <= q; ++p) update.element(p, q);
  }
}

// The factor no longer fits. The structure of a sparse one stays; a separate array goes back.
void forget_factor(SmMatrix& g) {
  if (g.state == SM_STATE_FACTORED) {
    g.state = SM_STATE_SYMBOLIC;
    if (!is_symmetric_sparse(g)) give_back(g.pool, g.dense_factor);
  } else if (!is_symmetric_sparse(g)) {
    drop_separate_factor(g);
  }
  void_results(g);
}

Gate may_update(const SmMatrix& g, const SmMatrix& a, const SmMatrix& b) {
  SM_STOP_IF(g.nnz < 1, SM_OK);
  SM_STOP_IF(!is_closed(g), SM_NOT_CLOSED);
  SM_STOP_IF(&g == &a || &g == &b, SM_BAD_ARGUMENT);
  SM_STOP_IF(g.kind != SM_KIND_SYMMETRIC || a.kind != SM_KIND_SYMMETRIC || b.kind != SM_KIND_SYMMETRIC,
             SM_KIND_MISMATCH);
  return {};
}

}  // namespace

SmStatus update_ginv(SmMatrix& g, SmMatrix& a, SmMatrix& b, i64 r, i64 c, double s) {
  SM_PASS(may_update(g, a, b));
  if (g.format == SM_FORMAT_SPARSE) {
    if (b.format != SM_FORMAT_SPARSE) return SM_UNAVAILABLE;
    update_sparse(g, a, b, r, c, s);
  } else if (is_dense_format(g.format)) {
    if (a.format != g.format || b.format != g.format) return SM_UNAVAILABLE;
    if (g.format == SM_FORMAT_ROWS) {
      update_by_rows(g, a, b, r, c, s);
    } else {
      update_by_columns(g, a, b, r, c, s);
    }
  }
  forget_factor(g);
  return SM_OK;
}

}  // namespace sm
