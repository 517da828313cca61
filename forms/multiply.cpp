// Products of two matrices, entered element by element into a third.
#include "forms/lanes.hpp"
#include "forms/operations.hpp"
#include "forms/results.hpp"
#include "forms/rows.hpp"

namespace sm {

namespace {

// Which pairs are served:
//   A \ B                general   symmetric   diagonal
//   general 21, 22, 23   yes       124         yes
//   symmetric 21, 23     yes       yes         yes
//   symmetric 22         124       yes         yes
//   diagonal             yes       yes         yes
bool serves(const SmMatrix& a, const SmMatrix& b) {
  const bool general = b.kind == SM_KIND_GENERAL;
  const bool symmetric = b.kind == SM_KIND_SYMMETRIC;
  const bool diagonal = b.kind == SM_KIND_DIAGONAL;
  switch (a.kind) {
    case SM_KIND_GENERAL:
      return general || diagonal;
    case SM_KIND_SYMMETRIC:
      return (general && a.format != SM_FORMAT_COLUMNS) || symmetric || diagonal;
    case SM_KIND_DIAGONAL:
      return general || symmetric || diagonal;
    default:
      return false;
  }
}

Gate may_multiply(const SmMatrix& a, const SmMatrix& b, const SmMatrix& c) {
  SM_STOP_IF(a.nnz < 1 && b.nnz < 1, SM_OK);
  SM_STOP_IF(a.kind == SM_KIND_NONE, SM_UNTYPED);
  SM_STOP_IF(!is_closed_or_empty(a) || !is_closed_or_empty(b), SM_NOT_CLOSED);
  SM_STOP_IF(&c == &a || &c == &b, SM_BAD_ARGUMENT);
  SM_STOP_IF(a.cols != b.rows, SM_DIMENSION_MISMATCH);
  const bool one_is_diagonal = a.kind == SM_KIND_DIAGONAL || b.kind == SM_KIND_DIAGONAL;
  SM_STOP_IF(c.kind == SM_KIND_DIAGONAL && !one_is_diagonal, SM_DIMENSION_MISMATCH);
  return {};
}

// Where elements of the product go. Those that C has no place for are passed over: below the diagonal of a symmetric C,
// off that of a diagonal one, outside an array; but not when it is the array that is missing, for want of memory.
class Sink {
 public:
  Sink(SmMatrix& c, SmStatus sized) : c_(c), unsized_(or_why_unsized(SM_BAD_ARGUMENT, sized)) {}

  void add(i64 i, i64 j, double value) {
    if (status_ != SM_OK) return;
    const SmStatus status = assign(c_, i, j, true, value);
    const bool has_no_place = status == SM_BAD_ARGUMENT || status == SM_OUTSIDE;
    if (!has_no_place) {
      status_ = status;
    } else if (unsized_ != SM_BAD_ARGUMENT) {
      status_ = unsized_;
    }
  }
  SmStatus status() const { return status_; }

 private:
  SmMatrix& c_;
  SmStatus unsized_;
  SmStatus status_ = SM_OK;
};

// Every pair of an element (i, k) of A and one (k, j) of B is entered on its own.
template <class A, class B>
SmStatus enter_pairs(A& a, B& b, i64 rows, Sink& sink) {
  for (i64 i = 0; i < rows && sink.status() == SM_OK; ++i) {
    a.row(i, [&](i64 k, double v) { b.row(k, [&](i64 j, double w) { sink.add(i, j, v * w); }); });
  }
  return sink.status();
}

// Full rows of B: a row of the product is complete before it is entered, once for every column.
template <class A, class B>
SmStatus enter_rows(A& a, B& b, i64 rows, i64 cols, MemoryPool* pool, Sink& sink) {
  Scratch<double> work;
  SM_TRY(work.take(pool, cols));
  double* sum = work.data();
  for (i64 i = 0; i < rows && sink.status() == SM_OK; ++i) {
    bool any = false;
    a.row(i, [&](i64 k, double v) {
      if (!any) std::fill_n(sum, cols, 0.0);
      any = true;
      b.row(k, [&](i64 j, double w) { sum[j] += v * w; });
    });
    for (i64 j = 0; j < cols && any; ++j) sink.add(i, j, sum[j]);
  }
  return sink.status();
}

SmStatus enter_product(SmMatrix& a, SmMatrix& b, SmMatrix& c, SmStatus sized) {
  if (a.nnz < 1 || b.nnz < 1) return SM_OK;
  SM_TRY(need_pool(a));
  Sink sink(c, sized);
  return with_rows(a, a.pool, [&](auto& left) {
    return with_rows(b, a.pool, [&]<class Right>(Right& right) {
      if constexpr (Right::is_full) return enter_rows(left, right, a.rows, b.cols, a.pool, sink);
      return enter_pairs(left, right, a.rows, sink);
    });
  });
}

// Two diagonal matrices into a third: written, not added.
SmStatus write_diagonal(const SmMatrix& a, const SmMatrix& b, SmMatrix& c) {
  double* values = nullptr;
  SM_TRY(claim_values(c, a.rows, values));
  for (i64 i = 0; i < a.rows; ++i) values[i] = a.values[i] * b.values[i];
  return SM_OK;
}

}  // namespace

SmStatus multiply_matrices(SmMatrix& a, SmMatrix& b, SmMatrix& c, bool keep) {
  SM_PASS(may_multiply(a, b, c));
  const SmStatus sized = keep ? SM_OK : resize(c, a.rows, b.cols);
  if (!serves(a, b)) return SM_UNAVAILABLE;
  const bool diagonals = a.kind == SM_KIND_DIAGONAL && b.kind == SM_KIND_DIAGONAL;
  if (diagonals && c.kind == SM_KIND_DIAGONAL) {
    return a.nnz < 1 || b.nnz < 1 ? SM_OK : or_why_unsized(write_diagonal(a, b, c), sized);
  }
  SM_TRY(enter_product(a, b, c, sized));
  return diagonals && !keep ? close(c, 0.0) : SM_OK;
}

}  // namespace sm
