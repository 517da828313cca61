// The two roads of ginverse2, which agree to rounding: the plain one, and the blocked one for larger orders.
#pragma once

#include <cmath>

#include "cholesky/steps.hpp"

namespace sm {

// What both take: the caller's array, which neither changes unless it answers 0, and what to make of it.
struct PackedJob {
  double* array;
  i64 n;
  std::int32_t format;
  std::int32_t mode;
  double tolerance;
};

// Of the accepted pivots.
struct PackedReport {
  double log_det = 0.0;
  i64 rank = 0;

  void take(double r) {
    if (!(r > 0.0)) return;
    log_det += 2.0 * std::log(r);
    ++rank;
  }
};

// r_kk from the pivot d of a diagonal element a; 0 when it is dropped.
[[nodiscard]] inline SmStatus find_root(double a, double tolerance, double d, double& r) {
  const PivotLimits limits(a, tolerance);
  r = d > limits.accept ? std::sqrt(d) : 0.0;
  return d < limits.refuse ? SM_NOT_DEFINITE : SM_OK;
}

inline constexpr i64 kLeastSlabOrder = 24;  // the plain road is faster up to 16

[[nodiscard]] SmStatus ginverse2_by_columns(MemoryPool* pool, const PackedJob& job, PackedReport& report);
[[nodiscard]] SmStatus ginverse2_in_slabs(MemoryPool* pool, const PackedJob& job, PackedReport& report);

}  // namespace sm
