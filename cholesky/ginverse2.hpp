// Factor and generalized inverse of a packed symmetric matrix.
#pragma once

#include "frame/core.hpp"

namespace sm {

// What ginverse2 makes of its array.
inline constexpr std::int32_t kPackedInverse = 0;          // A -> A^-
inline constexpr std::int32_t kPackedFactor = 5;           // A -> R with R'R = A
inline constexpr std::int32_t kPackedFactorToInverse = 6;  // R -> A^-

// Works on the packed upper triangle `array` of order n, in the layout of `format` (22 by columns, 23 by rows), in
// natural order. A pivot is accepted above |a_kk| * tolerance and refused below the limits of PivotLimits.
//   R: a dropped pivot has r_kk = 0 and zeros in the rest of its row; its column above stays.
//   A^-: the inverse of the accepted block, zeros elsewhere; the same from A and from R.
// log_det, rank and definite describe the accepted pivots. 103 (definite 0) and 101 leave the array, log_det and rank
// as they were. Work, from the instance's pool: one more triangle, and up to 300 doubles a row.
[[nodiscard]] SmStatus ginverse2(SmInstance* instance, double* array, i64 n, double* log_det, i64* rank,
                                 std::int32_t mode, double tolerance, std::int32_t format, std::int16_t* definite);

// The same of a single element, without the report: what a diagonal preconditioner asks for, once a row. 103.
[[nodiscard]] SmStatus invert_pivot(double a, double tolerance, double& inverse);

}  // namespace sm
