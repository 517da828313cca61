// How near the pivots of a singular matrix come to the bound below which they are dropped: a plain factorization, row
// by row, that keeps its pivots.
#pragma once

#include <vector>

#include "bench/harness/upper_rows.hpp"

namespace sm::bench {

struct PivotMargins {
  int accepted = 0;
  double largest_dropped = 0.0;  // |pivot| over its bound, 1 being the bound
  double smallest_accepted = 0.0;
};

// In the given order; a pivot is accepted when it is above the diagonal element times `tolerance`.
PivotMargins pivot_margins(const UpperRows& rows, const std::vector<int>& order, double tolerance);

}  // namespace sm::bench
