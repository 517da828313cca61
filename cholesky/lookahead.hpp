// Fetching ahead of a walk over the stored rows in the new order, which jumps through four arrays.
#pragma once

#include <algorithm>

#include "frame/core.hpp"

namespace sm {

class LookAhead {
 public:
  LookAhead(const SmMatrix& m, bool values) : m_(m), values_(values), columns_(m.rows > kCached) {}

  // While row k is in work: each stage needs what the one before has fetched some rows earlier. Inlined by order: GCC
  // takes a function that only fetches for one without effect, and drops its calls.
  [[gnu::always_inline]] void past(i64 k) const {
    if (k + 3 * kRows >= m_.rows) return;  // the last rows come without
    __builtin_prefetch(m_.row_start + m_.perm[k + 3 * kRows]);
    const i64* row_start = m_.row_start + m_.perm[k + 2 * kRows];
    const i64 ends[] = {row_start[0], row_start[1] - 1};  // most rows are short, and lie in two lines of the cache
    for (const i64 p : ends) {
      __builtin_prefetch(m_.col_index + p);
      if (values_) __builtin_prefetch(m_.nz_values + p);
    }
    if (!columns_) return;
    const i64 row = m_.perm[k + kRows];
    const i64 end = std::min(m_.row_start[row + 1], m_.row_start[row] + kEntries);
    for (i64 p = m_.row_start[row]; p < end; ++p) __builtin_prefetch(m_.inv_perm + m_.col_index[p]);
  }

 private:
  static constexpr i64 kRows = 8;
  static constexpr i64 kEntries = 8;
  static constexpr i64 kCached = 50000;  // words that stay in the second-level cache anyway

  const SmMatrix& m_;
  bool values_;
  bool columns_;
};

}  // namespace sm
