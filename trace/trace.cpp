// The trace of a matrix, and of a product with an inverse.
#include <algorithm>

#include "cholesky/steps.hpp"
#include "store/operations.hpp"
#include "store/views.hpp"
#include "trace/operations.hpp"

namespace sm {

namespace {

Gate may_trace_inverse_product(const SmMatrix& a, const SmMatrix& b) {
  SM_STOP_IF(a.nnz < 1 && b.nnz < 1, SM_NOTHING_TO_REPORT);
  SM_STOP_IF(a.kind == SM_KIND_NONE || b.kind == SM_KIND_NONE, SM_NOTHING_TO_REPORT);
  SM_STOP_IF(!is_closed_or_empty(a) || !is_closed_or_empty(b), SM_NOT_CLOSED);
  SM_STOP_IF(a.rows != a.cols || a.rows != b.rows, SM_NOT_SQUARE);
  SM_STOP_IF(a.kind != SM_KIND_SYMMETRIC && a.kind != SM_KIND_DIAGONAL, SM_UNAVAILABLE);
  SM_STOP_IF(a.state > SM_STATE_FACTORED, SM_UNAVAILABLE);
  return {};
}

}  // namespace

SmStatus trace(SmMatrix& a, double& result) {
  result = missing();
  if (a.nnz < 1 || a.kind == SM_KIND_NONE) return SM_NOTHING_TO_REPORT;
  if (!is_closed(a)) return SM_NOT_CLOSED;
  if (a.kind != SM_KIND_GENERAL && a.kind != SM_KIND_SYMMETRIC && a.kind != SM_KIND_DIAGONAL) return SM_KIND_MISMATCH;
  return visit(a, [&](const auto& view) {
    result = 0.0;
    for (i64 i = 0; i < std::min(view.rows, view.cols); ++i) {
      if (const double* v = view.diagonal(i)) result += *v;
    }
    return SM_OK;
  });
}

// Row j of B stands for its column j, which it is when B is symmetric. x and y are as long as the longer of the two
// sides: a row of B has as many elements as B has columns, and a solve takes n of them.
SmStatus trace_of_inverse_product(SmMatrix& a, SmMatrix& b, i64 start, double& result) {
  result = missing();
  SM_PASS(may_trace_inverse_product(a, b));
  if (a.state < SM_STATE_FACTORED) SM_TRY(factor(a, false));
  Scratch<double> x;
  Scratch<double> y;
  SM_TRY(need_pool(a));
  SM_TRY(x.take(a.pool, std::max(a.rows, b.cols), Fill::zero));
  SM_TRY(y.take(a.pool, a.rows, Fill::zero));
  if (start == 0 && trace_on_pattern(a, b, result)) return SM_OK;
  result = 0.0;
  if (start < 0) return SM_OUTSIDE;  // what the first row would answer, unless B is empty
  for (i64 j = start; j < a.rows; ++j) {
    SM_TRY(row(b, j, x.data(), start));
    SM_TRY(substitute(a, x.data(), y.data(), 1));
    result += y.data()[j];
  }
  return SM_OK;
}

}  // namespace sm
