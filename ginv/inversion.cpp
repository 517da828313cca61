// Replacing a packed or diagonal matrix by its generalized inverse, in the values or in the separate array beside them.
#include <algorithm>
#include <cmath>

#include "cholesky/ginverse2.hpp"
#include "cholesky/steps.hpp"
#include "ginv/operations.hpp"
#include "store/checks.hpp"

namespace sm {

namespace {

// The separate array takes the place of the values; an owned value array goes back, a tied one is let go.
void promote_separate_array(SmMatrix& a) {
  if (a.owns_values) give_back(a.pool, a.values);
  a.values = a.dense_factor;
  a.dense_factor = nullptr;
  a.owns_values = 1;
}

// State 6: the inverse is there; all that can be asked is where it should be.
SmStatus keep_inverse(SmMatrix& a, bool in_place) {
  if (!a.dense_factor) return in_place ? SM_OK : SM_NO_FACTOR;
  if (in_place) promote_separate_array(a);
  return SM_OK;
}

// State 5: where the factor is, moved into the values when that is where the inverse is wanted.
SmStatus choose_factor(SmMatrix& a, bool in_place, double*& array) {
  if (!a.dense_factor && !in_place) return SM_NO_FACTOR;
  if (a.dense_factor && in_place) promote_separate_array(a);
  array = factor_array(a);
  return SM_OK;
}

SmStatus invert_packed_factor(SmMatrix& a, bool in_place, double tolerance) {
  double* array = nullptr;
  SM_TRY(choose_factor(a, in_place, array));
  double log_det = 0.0;  // the factorization's own figures stay
  i64 rank = 0;
  std::int16_t definite = 0;
  return ginverse2(a.instance, array, a.rows, &log_det, &rank, kPackedFactorToInverse, tolerance, a.format, &definite);
}

SmStatus invert_diagonal_factor(SmMatrix& a, bool in_place) {
  double* array = nullptr;
  SM_TRY(choose_factor(a, in_place, array));
  for (i64 i = 0; i < a.rows; ++i) {
    if (array[i] > 0.0) array[i] = 1.0 / (array[i] * array[i]);
  }
  return SM_OK;
}

SmStatus invert_diagonal_values(SmMatrix& a, bool in_place, double tolerance) {
  double* array = nullptr;
  SM_TRY(choose_array(a, in_place, array));
  a.rank = 0;
  a.log_det = 0.0;
  a.definite = 1;
  for (i64 i = 0; i < a.rows; ++i) {
    const double d = array[i];
    if (d >= tolerance) {
      array[i] = 1.0 / d;
      a.log_det += std::log(d);
      ++a.rank;
    } else if (d < kDiagonalRefusal) {
      void_results(a);
      a.definite = 0;
      return SM_NOT_DEFINITE;
    } else {
      array[i] = 0.0;
    }
  }
  return SM_OK;
}

}  // namespace

SmStatus invert(SmMatrix& a, bool in_place, double tolerance) {
  SM_PASS(may_read(a));
  if (a.state == SM_STATE_INVERTED) return keep_inverse(a, in_place);
  if (a.rows != a.cols) return SM_NOT_SQUARE;
  if (std::isnan(tolerance)) tolerance = singularity_tolerance(a);
  const bool factored = a.state == SM_STATE_FACTORED;
  if (a.kind == SM_KIND_SYMMETRIC && is_dense_format(a.format)) {
    SM_TRY(factored ? invert_packed_factor(a, in_place, tolerance)
                    : transform_packed(a, in_place, kPackedInverse, tolerance));
  } else if (a.kind == SM_KIND_DIAGONAL) {
    SM_TRY(factored ? invert_diagonal_factor(a, in_place) : invert_diagonal_values(a, in_place, tolerance));
  } else {
    return SM_UNAVAILABLE;
  }
  a.state = SM_STATE_INVERTED;
  return SM_OK;
}

}  // namespace sm
