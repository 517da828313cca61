// A matrix times a number, in place, with what is kept of its factor.
#include <cmath>

#include "forms/operations.hpp"
#include "store/checks.hpp"
#include "store/views.hpp"

namespace sm {

namespace {

// Reciprocal pivots of s U'DU. A dropped pivot stays dropped. The sign of s is not looked at: what a factor of a matrix
// that is no longer definite means is up to the caller.
void scale_sparse_factor(SmMatrix& a, double s) {
  if (a.state != SM_STATE_FACTORED || !a.factor_diag) return;
  for (i64 k = 0; k < a.rows; ++k) {
    if (a.factor_diag[k] > 0.0) a.factor_diag[k] /= s;
  }
}

// Of s A, s > 0: square roots grow by that of s, an inverse shrinks. For another s there is no such factor, and the
// array is left as it is.
void scale_separate_array(SmMatrix& a, double s) {
  if (!a.dense_factor || a.state < SM_STATE_FACTORED || !(s > 0.0)) return;
  const i64 count = static_cast<i64>(a.value_count);
  const bool is_factor = a.state == SM_STATE_FACTORED;
  const double root = std::sqrt(s);
  for (i64 i = 0; i < count; ++i) a.dense_factor[i] = is_factor ? a.dense_factor[i] * root : a.dense_factor[i] / s;
}

}  // namespace

SmStatus scale(SmMatrix& a, double s) {
  SM_PASS(may_read(a));
  SM_TRY(visit(a, [&](const auto& view) {
    view.entries([&](i64, i64, double& v) { v *= s; });
    return SM_OK;
  }));
  if (is_symmetric_sparse(a)) {
    scale_sparse_factor(a, s);
  } else if (has_value_array(a)) {
    scale_separate_array(a, s);
  }
  if (!std::isnan(a.log_det) && a.rank >= 0 && s > 0.0) a.log_det += static_cast<double>(a.rank) * std::log(s);
  return SM_OK;
}

}  // namespace sm
