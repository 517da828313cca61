// The Hermite form H = A^- A.
#include <algorithm>
#include <bit>
#include <cmath>

#include "cholesky/steps.hpp"
#include "ginv/operations.hpp"
#include "store/checks.hpp"
#include "store/operations.hpp"
#include "store/views.hpp"

namespace sm {

namespace {

// Elements of a sparse H at or below this are not stored.
constexpr double kHermiteDrop = std::bit_cast<double>(SM_TOLERANCE_BITS);

// A record on loan from the instance.
class TemporaryMatrix {
 public:
  explicit TemporaryMatrix(SmInstance& instance) : instance_(instance) {}
  ~TemporaryMatrix() { qxsmDestroyMatrix(&instance_, &matrix_); }
  TemporaryMatrix(const TemporaryMatrix&) = delete;
  TemporaryMatrix& operator=(const TemporaryMatrix&) = delete;
  SmMatrix*& get() { return matrix_; }

 private:
  SmInstance& instance_;
  SmMatrix* matrix_ = nullptr;
};

SmStatus packed_hermite(SmMatrix& a, SmMatrix& h) {
  SM_TRY(invert(a, false, missing()));
  TemporaryMatrix inverse(*a.instance);
  SM_TRY(make(*a.instance, inverse.get(), a.kind, a.format));
  SM_TRY(tie(*inverse.get(), a.dense_factor, a.rows, a.cols, a.kind, a.format));
  return qxsmmultm(inverse.get(), &a, &h, 0);
}

// Whether an element found its place is not asked, but an H that lacks some for want of memory is not passed off as one.
SmStatus wants_memory(SmStatus status) {
  return status == SM_NO_MEMORY || status == SM_TOO_LARGE ? status : SmStatus{SM_OK};
}
SmStatus enter(SmMatrix& h, i64 i, i64 j, double value) { return wants_memory(assign(h, i, j, false, value)); }

// Column j of a symmetric matrix, whichever way round its pairs are stored.
void column(const UpperRows& rows, i64 j, double* x) {
  std::fill_n(x, rows.rows, 0.0);
  rows.entries([&](i64 i, i64 c, double v) {
    if (i == j) x[c] = v;
    if (c == j) x[i] = v;
  });
}

SmStatus sparse_hermite(SmMatrix& a, SmMatrix& h) {
  SM_TRY(factor(a, false));
  Scratch<double> x;
  Scratch<double> y;
  SM_TRY(x.take(a.pool, a.rows));
  SM_TRY(y.take(a.pool, a.rows));
  const UpperRows rows(a);
  for (i64 j = 0; j < a.rows; ++j) {
    column(rows, j, x.data());
    SM_TRY(substitute(a, x.data(), y.data(), 1));
    for (i64 i = 0; i < a.rows; ++i) {
      if (std::fabs(y.data()[i]) > kHermiteDrop) SM_TRY(enter(h, i, j, y.data()[i]));
    }
  }
  return SM_OK;
}

SmStatus diagonal_hermite(SmMatrix& a, SmMatrix& h) {
  if (invert(a, false, missing()) != SM_OK) return SM_NO_ELEMENT;
  for (i64 i = 0; i < a.rows; ++i) SM_TRY(enter(h, i, i, a.dense_factor[i] * a.values[i]));
  return SM_OK;
}

Gate may_form(const SmMatrix& a, const SmMatrix& h) {
  SM_STOP_WITH(may_read(a));
  SM_STOP_IF(&a == &h, SM_BAD_ARGUMENT);
  SM_STOP_IF(a.rows != a.cols, SM_NOT_SQUARE);
  return {};
}

}  // namespace

SmStatus hermite(SmMatrix& a, SmMatrix& h) {
  SM_PASS(may_form(a, h));
  const SmStatus sized = resize(h, a.rows, a.rows);  // an H of the wrong kind is answered below
  if (a.kind == SM_KIND_SYMMETRIC) {
    if (h.kind != SM_KIND_GENERAL) return SM_KIND_MISMATCH;
    if (is_dense_format(a.format)) return packed_hermite(a, h);  // which sizes H again
    SM_TRY(wants_memory(sized));
    return sparse_hermite(a, h);
  }
  if (a.kind != SM_KIND_DIAGONAL) return SM_UNAVAILABLE;
  if (h.kind != SM_KIND_GENERAL && h.kind != SM_KIND_DIAGONAL) return SM_KIND_MISMATCH;
  SM_TRY(wants_memory(sized));
  return diagonal_hermite(a, h);
}

}  // namespace sm
