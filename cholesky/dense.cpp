// Factors of packed and diagonal matrices, in the values or in a separate array beside them.
#include <algorithm>
#include <cmath>

#include "cholesky/ginverse2.hpp"
#include "cholesky/steps.hpp"
#include "store/checks.hpp"

namespace sm {

SmStatus choose_array(SmMatrix& m, bool in_place, double*& array) {
  if (in_place) {
    give_back(m.pool, m.dense_factor);
    array = m.values;
    return SM_OK;
  }
  const i64 count = static_cast<i64>(m.value_count);
  if (!m.dense_factor) {
    SM_TRY(need_pool(m));
    SM_TRY(allocate(m.pool, count, Fill::none, m.dense_factor));
  }
  std::copy_n(m.values, count, m.dense_factor);
  array = m.dense_factor;
  return SM_OK;
}

SmStatus transform_packed(SmMatrix& m, bool in_place, std::int32_t mode, double tolerance) {
  const bool had_separate_array = m.dense_factor != nullptr;
  double* array = nullptr;
  SM_TRY(choose_array(m, in_place, array));
  const SmStatus status =
      ginverse2(m.instance, array, m.rows, &m.log_det, &m.rank, mode, tolerance, m.format, &m.definite);
  if (status == SM_NO_MEMORY && !had_separate_array) give_back(m.pool, m.dense_factor);
  return status;
}

SmStatus factor_packed(SmMatrix& m, bool in_place) {
  SM_TRY(transform_packed(m, in_place, kPackedFactor, singularity_tolerance(m)));
  m.state = SM_STATE_FACTORED;
  return SM_OK;
}

// Stores square roots, where the sparse factor stores reciprocals, and judges by absolute limits, where the sparse one
// is relative: both are part of the interface.
SmStatus factor_diagonal(SmMatrix& m, bool in_place) {
  double* array = nullptr;
  SM_TRY(choose_array(m, in_place, array));
  const double tolerance = singularity_tolerance(m);
  m.definite = 1;
  m.log_det = 0.0;
  m.rank = 0;
  for (i64 i = 0; i < m.rows; ++i) {
    const double d = array[i];
    if (d > tolerance) {
      m.log_det += std::log(d);
      array[i] = std::sqrt(d);
      ++m.rank;
    } else if (d < kDiagonalRefusal) {
      m.definite = 0;
      return SM_NOT_DEFINITE;
    } else {
      array[i] = 0.0;
    }
  }
  m.state = SM_STATE_FACTORED;
  return SM_OK;
}

}  // namespace sm
