// Dot product and scaled sum of contiguous vectors, in lanes that are ours and not the vector unit's, so that every CPU
// gives the same bits. Neither hands anything to a BLAS: a daxpy may skip a zero factor, and with it the NaN that an
// infinite element makes of it.
#pragma once

#include "frame/core.hpp"

namespace sm {

// Sum of x[i] y[i].
inline double lane_dot(const double* x, const double* y, i64 n) {
  double s[8] = {};
  i64 i = 0;
  for (; i + 8 <= n; i += 8) {
    for (int lane = 0; lane < 8; ++lane) s[lane] += x[i + lane] * y[i + lane];
  }
  for (int lane = 0; i < n; ++i, ++lane) s[lane] += x[i] * y[i];
  return ((s[0] + s[4]) + (s[2] + s[6])) + ((s[1] + s[5]) + (s[3] + s[7]));
}

// y += t v; y and v do not overlap.
inline void lane_add(double* __restrict y, const double* __restrict v, i64 n, double t) {
  for (i64 i = 0; i < n; ++i) y[i] += t * v[i];
}

}  // namespace sm
