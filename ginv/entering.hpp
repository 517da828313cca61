// Entries of one matrix, scaled, added to another through its own road.
#pragma once

#include <algorithm>

#include "store/operations.hpp"

namespace sm {

// A scale of exactly 1 costs no rounding and lets a NaN keep its bits.
inline double scaled(double s, double b) { return s == 1.0 ? b : s * b; }

// Adds s times each stored (i, j) of the view to the target's (off + i, off + j), that of a triangle with the smaller
// index first. The first answer that is not 0 ends it; 105 for an index that cannot be counted. `off` is not negative.
// A matrix may be added to itself: its keys are there already, so the walk is not disturbed.
template <class View>
[[nodiscard]] SmStatus enter_scaled(SmMatrix& target, const View& source, i64 off, double s) {
  SmStatus status = SM_OK;
  source.entries([&](i64 i, i64 j, double v) {
    i64 row = 0;
    i64 col = 0;
    if (status != SM_OK) return;
    if (View::one_triangle && j < i) std::swap(i, j);
    const bool countable = !__builtin_add_overflow(off, i, &row) && !__builtin_add_overflow(off, j, &col);
    status = countable ? assign(target, row, col, true, scaled(s, v)) : SM_TOO_LARGE;
  });
  return status;
}

}  // namespace sm
